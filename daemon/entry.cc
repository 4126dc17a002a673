#include "daemon/entry.h"

#include <cstdint>
#include <string_view>

#include "base/arithmetic.h"
#include "base/format.h"
#include "base/version.h"
#include "daemon/app_info_listener.h"
#include "daemon/daily_run.h"
#include "platform/guarded.h"

namespace tavrel {
namespace {

constexpr std::string_view kHelp =
    "Usage: tavrel [-d | -f | -t | -h | --version]\n"
    "\n"
    "Reports a device's usage statistics once a day.\n"
    "\n"
    "  (none)      Serve clients until 10 seconds have passed without an event\n"
    "  -d          Do the daily tasks for yesterday, unless they have been done\n"
    "  -f          Do the daily tasks for yesterday, even if they have been done\n"
    "  -t          Do the daily tasks for today\n"
    "  -h, --help  Print this help\n"
    "  --version   Print the version\n"
    "\n"
    "TAVREL_ROOT in the environment names the folder that holds the device's files\n"
    "(default: /). The exit status is always 0. See tavrel(8). tavrelctl(1) shows\n"
    "what a run would do and has done.\n";

// True when the wait ended for lack of events, false when the system ended it.
bool waitUntilIdle(EventLoop& loop, std::chrono::milliseconds idleSlice) {
  while (true) {
    switch (loop.runSlice(idleSlice)) {
      case EventLoop::Slice::HandledEvent:
        break;
      case EventLoop::Slice::TimedOut:
        return true;
      case EventLoop::Slice::Terminated:
        return false;
    }
  }
}

void serve(Platform& platform, std::chrono::milliseconds idleSlice) {
  const auto listener = startAppInfoListener(platform);
  bool isIdle = true;  // stays true when the handling of a message throws
  runGuarded(platform.log, "go on serving",
             [&] { isIdle = waitUntilIdle(platform.eventLoop, idleSlice); });
  if (!isIdle || !platform.state->appInfoRequested) return;
  platform.log->log(LogLevel::Default, "never received requested AAI, so moving along without it");
  runDailyIfNeeded(platform, plist::Array());
}

void run(Platform& platform, RunKind kind, std::int32_t today) {
  const plist::Array noAppInfo;
  switch (kind) {
    case RunKind::Daily:
      runDailyIfNeeded(platform, noAppInfo);
      break;
    case RunKind::Forced:
      dailyTasksForDay(platform, previousDay(today), noAppInfo);
      break;
    case RunKind::Today:
      dailyTasksForDay(platform, today, noAppInfo);
      break;
    case RunKind::Service:
      break;
  }
}

void answer(Platform& platform, std::string_view argument) {
  platform.log->log(LogLevel::Default, "Unknown arg: %s", argument);
  if (argument == "-h" || argument == "--help") platform.standardStreams->writeOutput(kHelp);
  if (argument == "--version") {
    platform.standardStreams->writeOutput(format("tavrel %s\n", version()));
  }
}

}  // namespace

std::optional<RunKind> runKindOf(std::span<const char* const> arguments) {
  if (arguments.size() == 1) return RunKind::Service;
  const std::string_view argument = arguments.empty() ? "" : arguments[1];
  if (argument == "-d") return RunKind::Daily;
  if (argument == "-f") return RunKind::Forced;
  if (argument == "-t") return RunKind::Today;
  return std::nullopt;
}

int runTavrel(Platform& platform, std::span<const char* const> arguments,
              std::chrono::milliseconds idleSlice) {
  platform.log->log(LogLevel::Default, "tavrel started");
  runGuarded(platform.log, "finish the run", [&] {
    const auto kind = runKindOf(arguments);
    if (kind == RunKind::Service) return serve(platform, idleSlice);
    if (arguments.empty()) return;
    const std::int32_t today = platform.statistics->BHDaysSince1970();
    kind ? run(platform, *kind, today) : answer(platform, arguments[1]);
  });
  platform.log->log(LogLevel::Default, "tavrel ended");
  return 0;
}

}  // namespace tavrel
