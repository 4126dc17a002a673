// tavrel-statsd: records what programs send as StatsD datagrams.
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <getopt.h>
#include <string>
#include <string_view>
#include <unistd.h>
#include <utility>
#include <vector>

#include "base/format.h"
#include "base/parse_number.h"
#include "base/program.h"
#include "base/system_text.h"
#include "base/version.h"
#include "statsd/recording_watch.h"
#include "statsd/statsd_recorder.h"
#include "statsd/statsd_sockets.h"

namespace tavrel {
namespace {

constexpr std::uint16_t kPort = 8125;
constexpr std::uint32_t kLongestIdle = 86'400;  // seconds

constexpr const char* kHelp =
    "Usage: tavrel-statsd [OPTIONS]\n"
    "Records counters, gauges, timers and histograms that programs send as StatsD datagrams.\n"
    "\n"
    "  --udp PORT      listen on 127.0.0.1:PORT (default 8125 when no socket is given)\n"
    "  --unix PATH     listen on a Unix datagram socket\n"
    "  --prefix TEXT   begin each key with TEXT (default \"statsd.\")\n"
    "  --idle SECONDS  exit after this time without a datagram; 0 means never (default 60)\n"
    "  --help, --version\n"
    "\n"
    "Sockets that the service manager passes replace --udp and --unix. See tavrel-statsd(8).\n";

struct Options {
  std::vector<std::uint16_t> ports;
  std::vector<std::string> paths;
  std::string prefix = "statsd.";
  std::uint32_t idleSeconds = 60;
};

void complain(std::string_view message) {
  std::fprintf(stderr, "tavrel-statsd: %s\n", std::string(message).c_str());
}

// An exit status when the program is not to run.
std::optional<int> parseOptions(int argc, char** argv, Options& options) {
  enum : int { kUdp = 256, kUnix, kPrefix, kIdle, kShowHelp, kVersion };
  constexpr option kOptions[] = {{"udp", required_argument, nullptr, kUdp},
                                 {"unix", required_argument, nullptr, kUnix},
                                 {"prefix", required_argument, nullptr, kPrefix},
                                 {"idle", required_argument, nullptr, kIdle},
                                 {"help", no_argument, nullptr, kShowHelp},
                                 {"version", no_argument, nullptr, kVersion},
                                 {nullptr, 0, nullptr, 0}};
  const auto misuse = [](std::string_view message) {
    complain(message);
    return 2;
  };
  for (;;) {
    const char* const word = argv[optind];
    // '+' takes the words in order, and ':' leaves messages to this function.
    const int found = getopt_long(argc, argv, "+:h", kOptions, nullptr);
    if (found == -1) break;
    switch (found) {
      case kUdp: {
        const auto port = parseNumber<std::uint16_t>(optarg);
        if (port.value_or(0) == 0) return misuse(format("not a port: %s: give 1 to 65535", optarg));
        options.ports.push_back(*port);
        break;
      }
      case kUnix:
        options.paths.emplace_back(optarg);
        break;
      case kPrefix:
        if (!isStatsdPrefix(optarg)) {
          return misuse(
              format("not a prefix: %s: give letters, digits, '.', '_' and '-', at most "
                     "200",
                     optarg));
        }
        options.prefix = optarg;
        break;
      case kIdle: {
        const auto seconds = parseNumber<std::uint32_t>(optarg);
        if (!seconds || *seconds > kLongestIdle)
          return misuse(format("not a time: %s: give 0 to %u seconds", optarg, kLongestIdle));
        options.idleSeconds = *seconds;
        break;
      }
      case kVersion:
        std::printf("tavrel-statsd %s\n", std::string(version()).c_str());
        return 0;
      case 'h':
      case kShowHelp:
        std::fputs(kHelp, stdout);
        return 0;
      case ':':
        return misuse(format("%s needs a value: see --help", word));
      default:
        return refuseArgument("tavrel-statsd", word);
    }
  }
  if (optind < argc) return refuseArgument("tavrel-statsd", argv[optind]);
  return std::nullopt;
}

Expected<std::vector<DatagramSocket>> openSockets(const Options& options) {
  auto sockets = activatedDatagramSockets();
  if (!sockets || !sockets->empty()) return sockets;
  std::vector<std::uint16_t> ports = options.ports;
  if (ports.empty() && options.paths.empty()) ports.push_back(kPort);
  const auto keep = [&](Expected<DatagramSocket> made) -> Status {
    if (!made) return made.error();
    sockets->push_back(std::move(*made));
    return Done{};
  };
  for (const std::uint16_t port : ports)
    if (Status kept = keep(openLoopbackSocket(port)); !kept) return kept.error();
  for (const std::string& path : options.paths)
    if (Status kept = keep(openUnixSocket(path)); !kept) return kept.error();
  return sockets;
}

// libbrimhold would only say that it cannot record.
bool isRootMissing() {
  const char* const root = std::getenv("TAVREL_ROOT");
  if (root == nullptr || *root == 0 || access(root, F_OK) == 0) return false;
  complain(format("cannot use device root %s: %s: name the device's folder with TAVREL_ROOT", root,
                  systemText(errno)));
  return true;
}

int run(int argc, char** argv) {
  Options options;
  if (const auto status = parseOptions(argc, argv, options)) return *status;
  if (isRootMissing()) return 1;
  const auto sockets = openSockets(options);
  if (!sockets) {
    complain(sockets.error().message);
    return 1;
  }
  StatsdRecorder recorder(options.prefix);
  // Datagrams are taken even when they cannot be recorded: the library tries again.
  RecordingWatch watch(complain);
  Status done = watch.look();
  bool isOutOfKeys = false;
  const auto pause = [&] {
    if (recorder.isOutOfKeys() && !std::exchange(isOutOfKeys, true)) {
      complain(
          "no room for further keys: lines with new names are refused until the program starts "
          "again: keep what varies, such as an id, out of names");
    }
    return watch.lookAt(std::chrono::steady_clock::now());
  };

  std::optional<std::chrono::milliseconds> idle;
  if (options.idleSeconds > 0) idle = std::chrono::seconds(options.idleSeconds);
  if (done) {
    done = receiveDatagrams(*sockets, idle,
                            {.take = [&](std::string_view datagram) { recorder.take(datagram); },
                             .dropTooLong = [&] { recorder.count(StatsdFault::TooLong); },
                             .pause = pause});
  }
  if (done) done = watch.look();
  if (done) return 0;
  complain(done.error().message);
  return 1;
}

}  // namespace
}  // namespace tavrel

int main(int argc, char** argv) {
  return tavrel::exitStatusOf("tavrel-statsd", [&] { return tavrel::run(argc, argv); });
}
