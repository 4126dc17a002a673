#include <netinet/in.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/un.h>

#include "recording.h"
#include "statsd/recording_watch.h"
#include "statsd/statsd_recorder.h"
#include "statsd/statsd_sockets.h"

namespace tavrel {
namespace {

const std::string kProgram = TAVREL_BUILD "/bin/tavrel-statsd";

sockaddr_un unixAddress(const std::string& path) {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  path.copy(address.sun_path, sizeof address.sun_path - 1);
  return address;
}

template <class Address>
void send(int family, const Address& address, const std::vector<std::string>& datagrams) {
  const Descriptor sender(socket(family, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  const auto* const target = reinterpret_cast<const sockaddr*>(&address);
  for (const std::string& datagram : datagrams) {
    ASSERT_EQ(sendto(sender.get(), datagram.data(), datagram.size(), 0, target, sizeof address),
              std::ssize(datagram));
  }
}

const std::string kInUse = ": Address already in use; stop or remove what uses it, or give another";

class Statsd : public Recording {
 protected:
  std::int64_t fault(const std::string& name, const std::string& prefix = "statsd.") {
    const std::string key = prefix + "tavrel-statsd." + name;
    for (const auto& [keyAndDay, value] : scalars)
      if (keyAndDay.first == key) return value;
    return 0;
  }
};

TEST_F(Statsd, RecordsWhatLinesSay) {
  const std::string kLongestName(1022, 'n');
  run([&] {
    StatsdRecorder recorder("s.");
    recorder.take("hits:1|c\nhits:2|c|@0.1\n\nhits:1:2|c|#tag\n");
    for (int i = 0; i < 3; ++i)
      recorder.take("thirds:1|c|@0.3");
    for (int i = 0; i < 10; ++i)
      recorder.take("tenths:0.1|c");
    recorder.take("level:3.9|g\nlevel:7.5|g\nlevel:+0.75|g\nlevel:-2|g");
    recorder.take("time:3.5|ms\ntime:4|h|@0.5\ntime:5|d|@0.00001");
    recorder.take("whole:9007199254740992|c\nwhole:0.5|c\r\nwhole:1|c \t\r\n\r\nwhole:0.5|c");
    recorder.take("nanoseconds:0.5|g\nnanoseconds:1795775475123456789|g\r");
    recorder.take("time:6:6:6:6|ms|@0.001");
    std::string many = "time:7";
    for (int i = 1; i < 1500; ++i)
      many += ":7";
    recorder.take(many + "|ms|@0.001");
    recorder.take("time:9|c");  // a scalar may have the same name as a series
    recorder.take("b\nset:1|s\n" + std::string(1023, 'n') + ":1|c\n" + kLongestName + ":1|c");
    recorder.count(StatsdFault::TooLong);
  });
  fold();
  const Scalars expected{{{"s.hits", kToday}, 24},
                         {{"s." + kLongestName, kToday}, 1},
                         {{"s.thirds", kToday}, 10},
                         {{"s.tenths", kToday}, 1},
                         {{"s.level", kToday}, 6},
                         {{"s.time", kToday}, 9},
                         {{"s.whole", kToday}, 9'007'199'254'740'994},
                         {{"s.nanoseconds", kToday}, 1'795'775'475'123'456'789},
                         {{"s.tavrel-statsd.malformed", kToday}, 1},
                         {{"s.tavrel-statsd.unsupported", kToday}, 1},
                         {{"s.tavrel-statsd.refused", kToday}, 1},
                         {{"s.tavrel-statsd.too_long", kToday}, 1}};
  EXPECT_EQ(scalars, expected);
  std::vector<double> times{3.5, 4, 4};
  times.insert(times.end(), 1000, 5);  // the maximum for one line
  times.insert(times.end(), 1000, 6);
  times.insert(times.end(), 1500, 7);
  EXPECT_EQ(records["s.time"], times);
}

TEST_F(Statsd, CountsLinesOfKeysBeyondTheLimits) {
  run([] {
    StatsdRecorder recorder("");
    for (int round = 0; round < 2; ++round)
      for (int i = 0; i < kBHKeys; ++i)
        recorder.take(std::to_string(i) + ":1|c");
    EXPECT_TRUE(recorder.isOutOfKeys());
  });
  run([] {
    StatsdRecorder recorder("");
    for (int i = 1000; i < 4000; ++i)
      recorder.take(std::to_string(i) + std::string(95, 'n') + ":1|c");
  });
  fold();
  EXPECT_EQ(scalar("4091"), 2);
  const int fits = (kBHNamesBytes - 91) / 99;  // exactly: 91 bytes are its own keys
  EXPECT_EQ(fault("refused", ""), 2 * 4 + 3000 - fits);
  EXPECT_EQ(scalars.size(), std::size_t{kBHKeys - 4 + 1} + fits);
}

TEST_F(Statsd, SaysOnceWhenThereIsNoRoomForFurtherKeys) {
  const std::string path = root / "statsd.sock";
  auto listening = openUnixSocket(path);
  ASSERT_TRUE(listening);
  std::vector<std::string> datagrams(5);
  for (int i = 0; i < kBHKeys; ++i)
    datagrams.at(std::size_t(i) / 1000) += std::to_string(i) + ":1|c\n";
  send(AF_UNIX, unixAddress(path), datagrams);
  const Descriptor passed(dup(listening->descriptor()));  // survives exec
  EXPECT_EQ(outputOf("LISTEN_FDS=1 exec sh -c 'LISTEN_PID=$$ exec " + kProgram +
                     " --idle 1' 2>&1 3<&" + std::to_string(passed.get())),
            "tavrel-statsd: no room for further keys: lines with new names are refused until the "
            "program starts again: keep what varies, such as an id, out of names\n");
  testClock().realtime = 0;
  fold();
  EXPECT_EQ(fault("refused"), 4);
}

TEST_F(Statsd, TakesSocketsOfTheServiceManagerAndEndsWhenIdle) {
  const std::string path = root / "statsd.sock";
  auto unixSocket = openUnixSocket(path);
  auto loopback = openLoopbackSocket(0);
  auto unused = openLoopbackSocket(0);
  ASSERT_TRUE(unixSocket && loopback && unused);
  EXPECT_EQ(std::filesystem::status(path).permissions(), std::filesystem::perms{0666})
      << "every user may send";
  sockaddr_in address{};
  socklen_t size = sizeof address;
  getsockname(loopback->descriptor(), reinterpret_cast<sockaddr*>(&address), &size);
  EXPECT_EQ(ntohl(address.sin_addr.s_addr), INADDR_LOOPBACK) << "no other machine may send";
  const std::uint16_t port = ntohs(address.sin_port);
  EXPECT_EQ(openLoopbackSocket(port).error().message,
            "cannot listen on UDP port " + std::to_string(port) + kInUse);
  // The datagrams wait for the program, which starts because of them.
  const std::string longest = std::string(kLongestDatagram - 7, '\n') + "long:1|c";
  send(AF_UNIX, unixAddress(path), {"u:1|c", longest.substr(1), longest, std::string()});
  send(AF_INET, address, {"i:2|c", "i:3|c\n", "t:1.5|ms"});
  const pid_t child = start([&] {
    dup2(unixSocket->descriptor(), 100);
    dup2(loopback->descriptor(), 101);
    dup2(unused->descriptor(), 3);
    dup2(100, 4);
    dup2(101, 5);
    setenv("LISTEN_PID", std::to_string(getpid()).c_str(), 1);
    setenv("LISTEN_FDS", "3", 1);
    execl(kProgram.c_str(), "tavrel-statsd", "--idle", "1", "--udp", "1", nullptr);
  });
  EXPECT_EQ(waitFor(child), 0);
  testClock().realtime = 0;
  fold();
  for (const auto& [keyAndDay, value] : scalars) {
    const std::string& key = keyAndDay.first;
    EXPECT_EQ(value, key == "statsd.i" ? 5 : 1) << key;
  }
  EXPECT_EQ(scalars.size(), 4U);
  EXPECT_EQ(fault("too_long"), 1);
  EXPECT_EQ(records["statsd.t"], std::vector<double>{1.5});
}

TEST_F(Statsd, OpensSocketsOfItsOwnAndRefusesWhatItCannotUse) {
  const std::string path = root / "own.sock";
  { auto left = openUnixSocket(path); }  // as after a kill
  const pid_t child = start([&] {
    execl(kProgram.c_str(), "tavrel-statsd", "--unix", path.c_str(), "--prefix", "", "--idle", "0",
          nullptr);
  });
  const Descriptor sender(socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  const sockaddr_un address = unixAddress(path);
  while (connect(sender.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0)
    sched_yield();
  EXPECT_EQ(write(sender.get(), "own:1|c", 7), 7);
  testClock().realtime = 0;
  while (scalars.empty())
    fold();
  EXPECT_EQ(scalars.begin()->first.first, "own");

  const std::string taken = "cannot listen on " + path + kInUse + "\n";
  const std::string file = root / "file";
  std::ofstream(file) << "kept";
  const std::tuple<std::string, int, std::string> cases[] = {
      {"--unix " + path, 1, taken},
      {"--unix " + file, 1, "cannot listen on " + file + kInUse + "\n"},
      {"--unix /x/" + std::string(106, 'x'), 1,
       "cannot listen on /x/" + std::string(106, 'x') + ": give a path of at most 107 bytes\n"},
      {"--unix /dev/null/x", 1, "cannot listen on /dev/null/x: Not a directory\n"},
      {"--udp 0", 2, "not a port: 0: give 1 to 65535\n"},
      {"--udp 65536", 2, "not a port: 65536: give 1 to 65535\n"},
      {"--prefix 'a b'", 2,
       "not a prefix: a b: give letters, digits, '.', '_' and '-', at most 200\n"},
      {"--idle 86401", 2, "not a time: 86401: give 0 to 86400 seconds\n"},
      {"--udp 65535 --idle", 2, "--idle needs a value: see --help\n"},
      {"--frob x", 2, "unexpected argument '--frob': see --help\n"},
      {"-xy", 2, "unexpected argument '-xy': see --help\n"},
      {"--idle 86400 --udp 65535 x", 2, "unexpected argument 'x': see --help\n"}};
  EXPECT_EQ(outputOf("TAVREL_ROOT=/none " + kProgram, 1),
            "tavrel-statsd: cannot use device root /none: No such file or directory: name the "
            "device's folder with TAVREL_ROOT\n");
  for (const auto& [options, status, message] : cases)
    EXPECT_EQ(outputOf(kProgram + " " + options, status), "tavrel-statsd: " + message);
  EXPECT_TRUE(std::filesystem::is_regular_file(file));
  EXPECT_EQ(
      outputOf("exec 3</dev/null; LISTEN_FDS=1 exec sh -c 'LISTEN_PID=$$ exec " + kProgram + "'",
               1),
      "tavrel-statsd: descriptor 3 of LISTEN_FDS is not a datagram socket: use ListenDatagram= "
      "in the socket unit\n");
  kill(child, SIGTERM);
  EXPECT_EQ(waitFor(child), SIGTERM);
}

TEST_F(Statsd, EndsWhenItsFileIsRemoved) {
  const std::string removed =
      "the process's file in /run/tavrel/stat has been removed: values are lost until the process "
      "is restarted";
  run([&] {
    add(1);
    RecordingWatch watch([](std::string_view why) { FAIL() << why; });
    RecordingWatch::Ticks now{};
    EXPECT_TRUE(watch.lookAt(now));
    std::filesystem::remove(folder / segments().front());
    EXPECT_TRUE(watch.lookAt(now += std::chrono::seconds(59)));
    EXPECT_EQ(watch.lookAt(now += std::chrono::seconds(1)).error().message, removed);
  });
  const std::string program = kProgram + " --idle 1 --unix " + (root / "own.sock").string();
  EXPECT_EQ(outputOf("exec 2>&1; timeout 60 " + program + " & while kill -0 $! && ! rm " +
                         folder.string() + "/*.segment; do :; done 2>/dev/null; wait $!",
                     1),
            "tavrel-statsd: " + removed + "\n");
  std::filesystem::remove(folder);
  EXPECT_EQ(outputOf(program),
            "tavrel-statsd: the device has no folder /run/tavrel/stat: nothing is recorded\n")
      << "once";
}

// Without a bound, the reception would take as long as the sender of the descriptor likes.
TEST(StatsdSockets, DoNotWaitForDescriptorsOfTheirSenders) {
  const Descriptor server(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
  sockaddr_in address{};
  address.sin_family = AF_INET;
  address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
  socklen_t size = sizeof address;
  auto* const any = reinterpret_cast<sockaddr*>(&address);
  ASSERT_TRUE(bind(server.get(), any, size) == 0 && listen(server.get(), 1) == 0 &&
              getsockname(server.get(), any, &size) == 0);
  auto passed = std::make_optional<Descriptor>(socket(AF_INET, SOCK_STREAM | SOCK_NONBLOCK, 0));
  connect(passed->get(), any, size);
  const Descriptor accepted(accept(server.get(), nullptr, nullptr));
  const std::string unread(1 << 16, 'x');
  while (write(passed->get(), unread.data(), unread.size()) > 0) {
  }
  const linger forEver{.l_onoff = 1, .l_linger = std::numeric_limits<int>::max()};
  ASSERT_EQ(setsockopt(passed->get(), SOL_SOCKET, SO_LINGER, &forEver, sizeof forEver), 0);

  int pair[2];
  ASSERT_EQ(socketpair(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0, pair), 0);
  const Descriptor sender(pair[0]);
  std::vector<DatagramSocket> listening;
  listening.emplace_back(pair[1]);
  std::string text = "a:1|c";
  iovec part{.iov_base = text.data(), .iov_len = text.size()};
  alignas(cmsghdr) std::array<char, CMSG_SPACE(sizeof(int))> control{};
  msghdr message{};
  message.msg_iov = &part;
  message.msg_iovlen = 1;
  message.msg_control = control.data();
  message.msg_controllen = control.size();
  cmsghdr* const header = CMSG_FIRSTHDR(&message);
  header->cmsg_level = SOL_SOCKET;
  header->cmsg_type = SCM_RIGHTS;
  header->cmsg_len = CMSG_LEN(sizeof(int));
  const int number = passed->get();
  std::memcpy(CMSG_DATA(header), &number, sizeof number);
  ASSERT_EQ(sendmsg(sender.get(), &message, 0), 5);
  passed.reset();
  std::string received;
  EXPECT_TRUE(receiveDatagrams(listening, std::chrono::milliseconds(0),
                               {.take = [&](std::string_view datagram) { received += datagram; },
                                .dropTooLong = [] {},
                                .pause = [] { return Status(Done{}); }}));
  EXPECT_EQ(received, "a:1|c");
}

TEST(StatsdSockets, SayWhatTheyCannotDo) {
  std::vector<DatagramSocket> others;
  others.emplace_back(open("/dev/null", O_RDONLY | O_CLOEXEC));
  EXPECT_EQ(receiveDatagrams(others, std::nullopt, {}).error().message,
            "cannot receive datagrams: Socket operation on non-socket");
  rlimit before{};
  ASSERT_EQ(getrlimit(RLIMIT_NOFILE, &before), 0);
  const rlimit none{.rlim_cur = 0, .rlim_max = before.rlim_max};
  ASSERT_EQ(setrlimit(RLIMIT_NOFILE, &none), 0);
  const auto made = openLoopbackSocket(0);
  setrlimit(RLIMIT_NOFILE, &before);
  EXPECT_EQ(made.error().message,
            "cannot create a socket: Too many open files; raise the number of files that a process "
            "may open (ulimit -n)");
}

}  // namespace
}  // namespace tavrel
