#include <atomic>
#include <chrono>
#include <sys/mman.h>
#include <sys/resource.h>
#include <sys/socket.h>

#include "platform/linux/service/file_notifications.h"
#include "platform/linux/service/service_client.h"
#include "platform/linux/service/service_message.h"
#include "platform/linux/service/service_socket.h"
#include "platform/linux/service/socket_service.h"
#include "platform/plist/binary.h"
#include "platform/plist/xml.h"
#include "tests/devices/device_services.h"

namespace tavrel {
namespace {

using namespace std::chrono_literals;
using Slice = EventLoop::Slice;

constexpr std::string_view kName = "com.norvane.tallied.tavrel";
constexpr int kAllSeals = F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_WRITE;

/// A service below its own root that notes what its peers send.
class ServiceTest : public testing::Test {
 protected:
  void listen() {
    listener = services->createListener(kName);
    ASSERT_TRUE(listener) << testing::PrintToString(log.lines);
    receive(*listener);
  }
  void receive(ServiceListener& from) {
    from.setPeerHandler([this](PeerConnection& peer) {
      ++peers;
      peer.setEventHandler([this](const plist::Value& event) {
        event.isNull() ? void(++closures) : messages.push_back(event.dictionary());
      });
      peer.resume();
    });
    from.resume();
  }
  ServiceClient connect() {
    auto client = ServiceClient::connect(*root, kName);
    if (!client) throw std::runtime_error(client.error().message);
    return *std::move(client);
  }
  /// Runs the loop until nothing more is ready, and returns the number of events. Activity that is
  /// not an event also ends an empty slice, so only several empty slices are conclusive.
  int drain() {
    int events = 0;
    for (int idle = 0; idle < 16; ++idle) {
      if (loop.runSlice(0ms) != Slice::HandledEvent) continue;
      ++events;
      idle = 0;
    }
    return events;
  }
  /// Sends one raw packet, passing `files` along.
  static void sendRaw(const ServiceClient& client, ByteSpan bytes, std::vector<int> files = {}) {
    iovec part{const_cast<std::byte*>(bytes.data()), bytes.size()};
    alignas(cmsghdr) char control[CMSG_SPACE(8 * sizeof(int))] = {};
    const std::size_t size = files.size() * sizeof(int);
    msghdr header{nullptr, 0, &part, 1, control, size == 0 ? 0 : CMSG_SPACE(size), 0};
    if (cmsghdr* const rights = CMSG_FIRSTHDR(&header)) {
      *rights = {CMSG_LEN(size), SOL_SOCKET, SCM_RIGHTS};
      std::memcpy(CMSG_DATA(rights), files.data(), size);
    }
    EXPECT_EQ(sendmsg(client.get(), &header, MSG_NOSIGNAL), static_cast<ssize_t>(bytes.size()));
  }
  static Descriptor memoryFile(ByteSpan content, int seals) {
    Descriptor file(memfd_create("test", MFD_CLOEXEC | MFD_ALLOW_SEALING));
    EXPECT_EQ(write(file.get(), content.data(), content.size()),
              static_cast<ssize_t>(content.size()));
    EXPECT_EQ(fcntl(file.get(), F_ADD_SEALS, seals), 0);
    return file;
  }
  auto refusesToListen(std::string_view why) {
    return services->createListener(kName) == nullptr && log.says(why);
  }
  static std::size_t openDescriptors() {
    const std::filesystem::directory_iterator entries("/proc/self/fd");
    return static_cast<std::size_t>(std::distance(entries, {}));
  }

  TemporaryRoot device;
  const std::string folder = device.root.path("");
  KeptLog log;
  LinuxEventLoop loop;
  std::unique_ptr<DeviceRoot> root = std::make_unique<DeviceRoot>(folder);
  std::unique_ptr<SocketServices> services = std::make_unique<SocketServices>(loop, *root, log);
  std::unique_ptr<ServiceListener> listener;
  std::vector<plist::Dictionary> messages;
  int peers = 0;
  int closures = 0;
};

TEST_F(ServiceTest, DeliversMessagesOfBothSizesAndEncodingsInOrder) {
  // Makes paths too long for a socket address.
  root = std::make_unique<DeviceRoot>(folder + "/" + std::string(150, 'r'));
  services = std::make_unique<SocketServices>(loop, *root, log);
  listen();
  const plist::Dictionary large{{"operation", 2}, {"data", std::string(1 << 20, 'x')}};
  {
    ServiceClient client = connect();
    ASSERT_TRUE(client.send({{"operation", 0}}));
    ASSERT_TRUE(client.send(large));
    sendRaw(client, asBytes(*plist::writeXml(plist::Dictionary{{"operation", 7}})));
  }
  // The peer, three messages and the closing.
  EXPECT_EQ(drain(), 5);
  ASSERT_EQ(messages.size(), 3U) << testing::PrintToString(log.lines);
  EXPECT_EQ(messages[0].number("operation")->int64(), 0);
  EXPECT_EQ(plist::Value(messages[1]), plist::Value(large));
  EXPECT_EQ(messages[2].number("operation")->int64(), 7);
  EXPECT_EQ(closures, 1);
  listener.reset();
  EXPECT_FALSE(std::filesystem::exists(serviceSocketPath(*root, kName)));
  EXPECT_EQ(log.lines, Lines());
}

TEST_F(ServiceTest, DropsPeersThatSendNoMessages) {
  listen();
  const std::string good = *plist::writeBinary(plist::Dictionary{{"operation", 0}});
  const auto goodBytes = asBytes(good);
  const Descriptor sealed = memoryFile(goodBytes, kAllSeals);
  const Descriptor writable = memoryFile(goodBytes, F_SEAL_SHRINK | F_SEAL_GROW);
  const Descriptor growing = memoryFile(goodBytes, F_SEAL_SHRINK | F_SEAL_WRITE);
  const Descriptor shrinking = memoryFile(goodBytes, F_SEAL_GROW | F_SEAL_WRITE);
  const Descriptor noMessage = memoryFile(asBytes("<plist"), kAllSeals);
  Descriptor huge(memfd_create("huge", MFD_CLOEXEC | MFD_ALLOW_SEALING));
  ASSERT_EQ(ftruncate(huge.get(), (16 << 20) + 1), 0);
  ASSERT_EQ(fcntl(huge.get(), F_ADD_SEALS, kAllSeals), 0);
  const Descriptor ordinary(open("/proc/self/exe", O_RDONLY | O_CLOEXEC));
  const std::tuple<std::string, std::vector<int>, const char*> cases[] = {
      {"garbage", {}, ""},
      {"", {noMessage.get()}, ""},
      {"", {}, "the packet is empty"},
      {*plist::writeXml(plist::Array{1}), {}, "the message is not a dictionary"},
      {std::string(70'000, 'x'), {}, "the packet is larger than 65536 bytes"},
      {good, {sealed.get()}, "a packet that passes a memory file must be empty"},
      {"", {sealed.get(), sealed.get(), sealed.get()}, "not exactly one descriptor"},
      {"", {writable.get()}, "not sealed against shrinking, growing and writing"},
      {"", {growing.get()}, "not sealed against shrinking, growing and writing"},
      {"", {shrinking.get()}, "not sealed against shrinking, growing and writing"},
      {"", {ordinary.get()}, "not a memory file that can be sealed"},
      {"", {huge.get()}, "the memory file has 16777217 bytes, the limit is 16777216"}};
  std::size_t before = 0;
  for (const auto& [packet, files, reason] : cases) {
    SCOPED_TRACE(testing::PrintToString(packet.substr(0, 20)) + " " + reason);
    log.lines.clear();
    closures = 0;
    const ServiceClient client = connect();
    sendRaw(client, asBytes(packet), files);
    sendRaw(client, goodBytes);
    EXPECT_EQ(drain(), 2) << "the peer and its end";
    ASSERT_EQ(log.lines.size(), 1U);
    EXPECT_TRUE(log.says(std::string(kName) + ": dropped peer " + std::to_string(getpid()) +
                         " (user " + std::to_string(getuid()) + "): "));
    EXPECT_TRUE(log.says(reason)) << log.lines.front();
    EXPECT_EQ(closures, 1);
    EXPECT_TRUE(messages.empty()) << "what a dropped peer sent later is not read";
    if (before == 0) before = openDescriptors();
    EXPECT_EQ(openDescriptors(), before) << "a passed descriptor stayed open";
  }

  // Beyond 20 lines a minute, they are only counted.
  for (int i = 0; i < 20; ++i) {
    sendRaw(connect(), asBytes("garbage"));
    drain();
  }
  log.lines.clear();
  listener.reset();
  EXPECT_EQ(log.lines, Lines{"12 more refusals were not logged"});
}

TEST_F(ServiceTest, LosesNothingOfABurstAndLetsPeersBeyondTheLimitWait) {
  rlimit descriptors{};
  ASSERT_EQ(getrlimit(RLIMIT_NOFILE, &descriptors), 0);
  descriptors.rlim_cur = descriptors.rlim_max;
  ASSERT_EQ(setrlimit(RLIMIT_NOFILE, &descriptors), 0);
  listen();
  constexpr std::size_t kExcess = 3;
  constexpr std::int64_t kRounds = 5;
  std::vector<ServiceClient> clients;
  for (std::size_t i = 0; i < limits::kServicePeers + kExcess; ++i) {
    if (i % 1000 == 0) drain();
    clients.push_back(connect());
    for (std::int64_t round = 0; round < kRounds; ++round)
      ASSERT_TRUE(clients[i].send({{"client", i}, {"round", round}}));
  }
  drain();
  EXPECT_EQ(peers, static_cast<int>(limits::kServicePeers));
  EXPECT_TRUE(log.says("new peers wait until one leaves: there are 2048"));
  EXPECT_EQ(messages.size(), limits::kServicePeers * kRounds);
  clients.erase(clients.begin(), clients.begin() + kExcess);
  drain();
  std::vector<std::int64_t> next(limits::kServicePeers + kExcess);
  for (const auto& message : messages) {
    const auto client = static_cast<std::size_t>(message.number("client")->int64());
    ASSERT_EQ(message.number("round")->int64(), next[client]++);
  }
  EXPECT_EQ(next, std::vector(next.size(), kRounds));
}

TEST_F(ServiceTest, SilentPeersStopCountingAsEvents) {
  listen();
  const auto silentEvents = [this] {
    int events = 0;
    for (int i = 0; i < 2 * limits::kSilentConnections; ++i) {
      connect();
      events += drain();
    }
    return events;
  };
  EXPECT_EQ(silentEvents(), 2 * limits::kSilentConnections) << "beginnings and ends";
  EXPECT_EQ(silentEvents(), 0);
  EXPECT_EQ(peers, 4 * limits::kSilentConnections) << "they are served all the same";
  ASSERT_TRUE(connect().send({{"operation", 0}}));
  EXPECT_EQ(drain(), 2) << "a message, and the closure of the peer that sent it";
  EXPECT_EQ(silentEvents(), 2 * limits::kSilentConnections);
}

TEST_F(ServiceTest, RefusesOtherUsers) {
  if (geteuid() != 0) GTEST_SKIP() << "only root can become another user";
  listen();
  // Circumvents the mode of the file, so that the check of the credentials itself is reached.
  const std::string socket = serviceSocketPath(*root, kName);
  struct stat status;
  ASSERT_EQ(stat(socket.c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 0777U, 0600U);
  const auto tryAsNobody = [this] {
    return inChild([this] {
      if (setgid(65534) != 0 || setuid(65534) != 0) return 100;
      auto client = ServiceClient::connect(*root, kName);
      return client && client->send({{"operation", 1}}) ? 0 : 1;
    });
  };
  ASSERT_EQ(chmod(folder.c_str(), 0755), 0);
  EXPECT_EQ(tryAsNobody(), 1);
  ASSERT_EQ(chmod(socket.c_str(), 0666), 0);
  EXPECT_EQ(tryAsNobody(), 0);
  EXPECT_EQ(drain(), 0);
  EXPECT_EQ(peers, 0);
  EXPECT_TRUE(log.says("(user 65534): only root and user 0 may use the service"));
}

TEST_F(ServiceTest, TakesThePlaceOfADeadServiceOnly) {
  const std::string socket = serviceSocketPath(*root, kName);
  EXPECT_EQ(inChild([this] { return services->createListener(kName).release() ? 0 : 1; }), 0);
  ASSERT_TRUE(std::filesystem::exists(socket)) << "as after a kill";
  EXPECT_EQ(
      ServiceClient::connect(*root, kName).error().message,
      "cannot connect to " + socket + ": Connection refused; start tavrel or its socket unit");
  listen();
  EXPECT_TRUE(refusesToListen("cannot listen at " + socket + ": another process listens there"));
  ASSERT_TRUE(connect().send({{"operation", 0}}));
  drain();
  EXPECT_EQ(messages.size(), 1U);

  // A listener that does not hold the lock, like that of the service manager.
  std::filesystem::remove(folder + "/run/tavrel/" + std::string(kName) + ".lock");
  log.lines.clear();
  EXPECT_TRUE(refusesToListen("another process listens there"));
  EXPECT_EQ(drain(), 0) << "a look at the socket is no peer, for whom it would be started";
  listener.reset();
  std::filesystem::create_directory(socket);
  EXPECT_TRUE(refusesToListen("the file there is not a socket; remove it"));
}

/// Runs in a separate process, whose descriptors 3 and 4 are `third` and `fourth`.
int takeOver(int third, int fourth, const char* names, const std::function<bool()>& check) {
  const Descriptor a(fcntl(third, F_DUPFD, 100)), b(fcntl(fourth, F_DUPFD, 100));
  if (dup2(a.get(), 3) != 3 || dup2(b.get(), 4) != 4) return 100;
  setenv("LISTEN_PID", std::to_string(getpid()).c_str(), 1);
  setenv("LISTEN_FDS", "2", 1);
  if (names) setenv("LISTEN_FDNAMES", names, 1);
  return check() ? 0 : 1;
}

TEST_F(ServiceTest, TakesOverTheServiceManagersSocket) {
  auto managers = ServiceSocket::open(*root, kName);
  ASSERT_TRUE(managers);
  ASSERT_EQ(fcntl(managers->get(), F_SETFL, 0), 0);  // blocking, as it may be when handed over
  const Descriptor stream(socket(AF_UNIX, SOCK_STREAM, 0));
  ASSERT_TRUE(connect().send({{"operation", 5}}));

  const auto serves = [this] {
    LinuxEventLoop childLoop;
    SocketServices childServices(childLoop, *root, log);
    auto taken = childServices.createListener(kName);
    if (!taken || !log.lines.empty()) return false;
    receive(*taken);
    while (childLoop.runSlice(0ms) == Slice::HandledEvent) {
    }
    const bool inheritable = (fcntl(3, F_GETFD) & FD_CLOEXEC) == 0;
    taken.reset();
    return messages.size() == 1 && messages[0].number("operation")->int64() == 5 && !inheritable &&
           std::filesystem::exists(serviceSocketPath(*root, kName));
  };
  const int good = managers->get();
  EXPECT_EQ(inChild([&] { return takeOver(stream.get(), good, nullptr, serves); }), 0);
  ASSERT_TRUE(connect().send({{"operation", 5}}));
  const std::string names = "other:" + std::string(kName);
  EXPECT_EQ(inChild([&] { return takeOver(good, good, names.c_str(), serves); }), 0);

  const auto refuses = [&] { return refusesToListen("is known to be"); };
  EXPECT_EQ(inChild([&] { return takeOver(good, good, "a:b", refuses); }), 0);
}

TEST_F(ServiceTest, NotificationsCountAndWakeThoseWhoWait) {
  constexpr std::string_view kNotification = "com.norvane.tallied.tavrel.logging";
  FileNotifications notifications(*root, log);
  notifications.post(kNotification);
  EXPECT_EQ(**notifications.waitBeyond(kNotification, 0, 1h), 1U);

  // Another process posts while this one posts and waits for the last post.
  const pid_t other = fork();
  for (int i = 0; i < 200; ++i)
    notifications.post(kNotification);
  if (other == 0) _exit(0);
  std::uint64_t seen = 1;
  while (seen < 401)
    seen = **notifications.waitBeyond(kNotification, seen, 1h);
  EXPECT_EQ(seen, 401U);
  waitpid(other, nullptr, 0);

  // Somebody who waits sees the first post after the folder was removed, but not the removal.
  const std::string notes = root->path("/run/tavrel/notifications");
  for (const std::uint64_t before : {seen, std::uint64_t{1}}) {
    std::atomic<bool> hasSeen = false;
    std::thread remover([&] {
      // Again, in case the other thread looks only after the post.
      while (!hasSeen) {
        std::filesystem::remove_all(notes);
        while (!hasSeen && !std::filesystem::exists(notes))
          std::this_thread::yield();
        notifications.post(kNotification);
      }
    });
    EXPECT_EQ(**notifications.waitBeyond(kNotification, before, 1h), 1U);
    hasSeen = true;
    remover.join();
  }
  const std::uint64_t last = *notifications.count(kNotification);
  EXPECT_FALSE(*notifications.waitBeyond(kNotification, last, 0s));
  std::filesystem::remove_all(notes);
  EXPECT_FALSE(*notifications.waitBeyond(kNotification, 1, 0s));
  std::filesystem::remove_all(notes);
  std::filesystem::create_symlink("nowhere", notes);
  EXPECT_FALSE(notifications.waitBeyond(kNotification, 1, 1h));
  std::filesystem::remove(notes);

  // A damaged counter does not block anybody.
  for (const char* const damaged : {"", "-1\n", "1111111111222222222233333333334444\n"}) {
    device.write("/run/tavrel/notifications/" + std::string(kNotification), damaged);
    log.lines.clear();
    notifications.post(kNotification);
    EXPECT_TRUE(log.lines.size() == 1 && log.says("; counting restarts at "));
    EXPECT_GT(*notifications.count(kNotification), seen);
    seen = *notifications.tryPost(kNotification);
    EXPECT_EQ(*notifications.count(kNotification), seen);
  }
  EXPECT_EQ(log.lines.size(), 1U);
  EXPECT_FALSE(notifications.tryPost("../escape"));
}

}  // namespace
}  // namespace tavrel
