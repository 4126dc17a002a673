// Messages through the named service, next to the same bytes through a bare socket pair.
#include <array>
#include <benchmark/benchmark.h>
#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <memory>
#include <string>
#include <sys/socket.h>

#include "platform/linux/service/service_client.h"
#include "platform/linux/service/service_message.h"
#include "platform/linux/service/socket_service.h"
#include "platform/plist/binary.h"

namespace tavrel {
namespace {

constexpr std::string_view kName = "com.norvane.tallied.tavrel";
/// Messages in flight; this many fit in the kernel's default socket buffer.
constexpr int kBatch = 50;

struct SilentLog final : SystemLog {
  void write(LogLevel, std::string_view) override {}
};

plist::Dictionary announcement() {
  return {{"operation", 0}};
}

plist::Dictionary delivery(std::int64_t applications) {
  plist::Array list;
  for (std::int64_t i = 0; i < applications; ++i) {
    const std::string number = std::to_string(i);
    list.append(plist::Dictionary{{"bundle_id", "org.example.application" + number},
                                  {"version", "1." + number},
                                  {"orbo_id", i},
                                  {"arch", 12},
                                  {"uuid", plist::Data(asBytes("0123456789abcdef"))}});
  }
  return {{"operation", 2}, {"app_data", list}};
}

class Service {
 public:
  Service() : folder_(makeFolder()), root_(folder_), services_(loop_, root_, log_) {
    listener_ = services_.createListener(kName);
    listener_->setPeerHandler([this](PeerConnection& peer) {
      peer.setEventHandler([this](const plist::Value&) { ++received_; });
      peer.resume();
    });
    listener_->resume();
  }
  ~Service() {
    listener_.reset();
    std::filesystem::remove_all(folder_);
  }
  ServiceClient connect() { return *ServiceClient::connect(root_, kName); }
  void receive(std::int64_t messages) {
    for (messages += received_; received_ < messages;)
      loop_.runSlice(std::chrono::seconds(10));
  }

 private:
  static std::string makeFolder() {
    std::string pattern = std::filesystem::temp_directory_path() / "tavrel-bench-XXXXXX";
    if (!mkdtemp(pattern.data())) std::abort();
    return pattern;
  }

  std::string folder_;
  DeviceRoot root_;
  SilentLog log_;
  LinuxEventLoop loop_;
  SocketServices services_;
  std::unique_ptr<ServiceListener> listener_;
  std::int64_t received_ = 0;
};

void bareSocketPair(benchmark::State& state) {
  std::array<int, 2> ends{};
  if (socketpair(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0, ends.data()) != 0) std::abort();
  const Descriptor sender(ends[0]), receiver(ends[1]);
  const std::string packet = *plist::writeBinary(announcement());
  std::array<char, 4096> buffer;
  for (auto _ : state) {
    for (int i = 0; i < kBatch; ++i)
      benchmark::DoNotOptimize(::send(sender.get(), packet.data(), packet.size(), 0));
    for (int i = 0; i < kBatch; ++i)
      benchmark::DoNotOptimize(recv(receiver.get(), buffer.data(), buffer.size(), 0));
  }
  state.SetItemsProcessed(state.iterations() * kBatch);
}
BENCHMARK(bareSocketPair);

void announcements(benchmark::State& state) {
  Service service;
  ServiceClient client = service.connect();
  for (auto _ : state) {
    for (int i = 0; i < kBatch; ++i)
      benchmark::DoNotOptimize(client.send(announcement()));
    service.receive(kBatch);
  }
  state.SetItemsProcessed(state.iterations() * kBatch);
}
BENCHMARK(announcements);

/// A connection, one message and the close: three events.
void connections(benchmark::State& state) {
  Service service;
  for (auto _ : state) {
    benchmark::DoNotOptimize(service.connect().send(announcement()));
    service.receive(2);
  }
  state.SetItemsProcessed(state.iterations());
}
BENCHMARK(connections);

void deliveries(benchmark::State& state) {
  Service service;
  ServiceClient client = service.connect();
  const plist::Dictionary message = delivery(state.range(0));
  for (auto _ : state) {
    benchmark::DoNotOptimize(client.send(message));
    service.receive(1);
  }
  state.SetItemsProcessed(state.iterations() * state.range(0));
}
BENCHMARK(deliveries)->Arg(50)->Arg(500)->Arg(5000)->Unit(benchmark::kMicrosecond);

}  // namespace
}  // namespace tavrel
