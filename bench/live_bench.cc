// Updates of live channels next to a bare loop that opens, reads and closes the same files: a tree
// in memory with the machine's own tables and a thousand files of one number each, so that neither
// includes the kernel's own cost of producing figures.
#include <benchmark/benchmark.h>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <memory>
#include <string>
#include <unistd.h>
#include <vector>

#include "platform/linux/live/live_machine.h"
#include "platform/report_protocol.h"

namespace {

using namespace tavrel;

struct NoLog : SystemLog {
  void write(LogLevel, std::string_view) override {}
};

constexpr const char* kTables[] = {"/proc/stat",      "/proc/vmstat",     "/proc/meminfo",
                                   "/proc/diskstats", "/proc/interrupts", "/proc/net/dev",
                                   "/proc/softirqs",  "/proc/uptime"};
constexpr const char* kNumbers[] = {"active_count", "event_count", "wakeup_count", "total_time_ms"};
constexpr int kDevices = 250;

class Tree {
 public:
  Tree() {
    if (!mkdtemp(folder_.data())) std::abort();
    for (const char* const table : kTables) {
      std::ifstream from(table);
      write(table) << from.rdbuf();
    }
    for (const auto& disk : std::filesystem::directory_iterator("/sys/block"))
      std::filesystem::create_directories(folder_ + disk.path().string());
    for (int i = 0; i < kDevices; ++i) {
      const std::string device = "/sys/class/wakeup/wakeup" + std::to_string(i) + '/';
      write(device + "name") << "source" << i << '\n';
      for (const char* const file : kNumbers)
        write(device + file) << 1000 + i << '\n';
    }
    // The names are read only once.
    std::erase_if(files_, [](const std::string& path) { return path.ends_with("/name"); });
  }
  ~Tree() { std::filesystem::remove_all(folder_); }
  Tree(const Tree&) = delete;
  Tree& operator=(const Tree&) = delete;

  const std::string& folder() const { return folder_; }
  const std::vector<std::string>& files() const { return files_; }

 private:
  std::ofstream write(const std::string& path) {
    files_.push_back(folder_ + path);
    std::filesystem::create_directories(std::filesystem::path(files_.back()).parent_path());
    return std::ofstream(files_.back());
  }

  std::string folder_ = "/dev/shm/tavrel-bench-XXXXXX";
  std::vector<std::string> files_;
};

struct Subscribed {
  explicit Subscribed(const DeviceRoot& root) : machine(root, log), sampling(machine.subscribe()) {
    for (const plist::Value& service : machine.services()) {
      const auto record = service.dictionary();
      const auto driver = static_cast<std::uint64_t>(record.number("EntryID")->int64());
      for (const plist::Value& group : record.dictionary("Properties").array("IOReportLegend")) {
        for (const plist::Value& channel : group.dictionary().array("IOReportChannels")) {
          const auto id = static_cast<std::uint64_t>(channel.array().at(0).number()->int64());
          largest = std::max(largest, sampling->add(driver, id));
          ++count;
        }
      }
    }
    room.resize(largest);
  }
  void update() {
    sampling->update();
    for (std::size_t i = 0; i < count; ++i)
      sampling->write(i, room);
    benchmark::DoNotOptimize(room.data());
  }

  NoLog log;
  LiveMachine machine;
  std::unique_ptr<LiveSampling> sampling;
  std::size_t count = 0;
  std::size_t largest = kElementBytes;
  std::vector<std::byte> room;
};

void bareReads(benchmark::State& state) {
  const Tree tree;
  std::vector<char> buffer(64U << 10);
  for (auto _ : state) {
    for (const std::string& file : tree.files()) {
      const int descriptor = open(file.c_str(), O_RDONLY | O_CLOEXEC);
      benchmark::DoNotOptimize(read(descriptor, buffer.data(), buffer.size()));
      close(descriptor);
    }
  }
  state.counters["files"] = static_cast<double>(tree.files().size());
}
BENCHMARK(bareReads);

void firstLiveUpdate(benchmark::State& state) {
  const Tree tree;
  const DeviceRoot root(tree.folder());
  for (auto _ : state) {
    state.PauseTiming();
    auto subscribed = std::make_unique<Subscribed>(root);
    state.ResumeTiming();
    subscribed->update();
    state.PauseTiming();
    state.counters["channels"] = static_cast<double>(subscribed->count);
    subscribed.reset();
    state.ResumeTiming();
  }
}
BENCHMARK(firstLiveUpdate);

void nextLiveUpdate(benchmark::State& state) {
  const Tree tree;
  const DeviceRoot root(tree.folder());
  Subscribed subscribed(root);
  for (auto _ : state)
    subscribed.update();
}
BENCHMARK(nextLiveUpdate);

void findLiveServices(benchmark::State& state) {
  const Tree tree;
  const DeviceRoot root(tree.folder());
  NoLog log;
  for (auto _ : state) {
    LiveMachine machine(root, log);
    benchmark::DoNotOptimize(machine.services());
  }
}
BENCHMARK(findLiveServices);

}  // namespace
