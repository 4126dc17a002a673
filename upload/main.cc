// tavrel-upload: sends waiting logs to a server, once.
#include <cstdio>
#include <cstdlib>
#include <getopt.h>
#include <string>

#include "base/program.h"
#include "base/version.h"
#include "platform/guarded.h"
#include "platform/linux/preferences/file_preferences.h"
#include "platform/linux/process/linux_clock.h"
#include "platform/linux/system_log/linux_system_log.h"
#include "platform/plist/coding.h"
#include "upload/uploader.h"

namespace tavrel::upload {
namespace {

// For scripts and units; tavrel-upload(8) lists them. The last two are those of sysexits.h.
enum ExitStatus : int { kDone = 0, kFailed = 1, kMisused = 2, kWaits = 75, kMisconfigured = 78 };

constexpr const char* kHelp =
    "Usage: tavrel-upload [--now]\n"
    "Sends the logs that wait for submission to the server that /etc/tavrel/upload.plist names.\n"
    "\n"
    "  --now  do not wait for the time of the next attempt after a failure\n"
    "  --help, --version\n"
    "\n"
    "See tavrel-upload(8).\n";

int upload(SystemLog& log, bool atOnce) {
  const DeviceRoot root = DeviceRoot::fromEnvironment();
  if (const Status usable = root.check(); !usable) {
    log.write(LogLevel::Error, usable.error().message);
    return kFailed;
  }
  FileSystem files;
  plist::PlistCoding propertyLists;
  LinuxClock clock;
  FilePreferences preferences(root, files, propertyLists, clock, log);

  const char* const credentials = std::getenv("CREDENTIALS_DIRECTORY");
  const auto configuration =
      readConfiguration(root, files, propertyLists, credentials ? credentials : "");
  if (!configuration) {
    log.write(LogLevel::Error, configuration.error().message);
    noteFailure({root, files, propertyLists, preferences, clock, log},
                configuration.error().message);
    return kMisconfigured;
  }
  Uploader uploader({root, files, propertyLists, preferences, clock, log}, *configuration);
  switch (uploader.run(atOnce)) {
    case Outcome::Done:
      return kDone;
    case Outcome::Waits:
      return kWaits;
    case Outcome::Misconfigured:
      return kMisconfigured;
    case Outcome::Failed:
      break;
  }
  return kFailed;
}

int run(int argc, char** argv) {
  constexpr option kOptions[] = {{"now", no_argument, nullptr, 'n'},
                                 {"help", no_argument, nullptr, 'h'},
                                 {"version", no_argument, nullptr, 'v'},
                                 {nullptr, 0, nullptr, 0}};
  bool atOnce = false;
  for (;;) {
    const char* const word = argv[optind];
    // '+' takes the words in order, and ':' leaves messages to this function.
    const int found = getopt_long(argc, argv, "+:h", kOptions, nullptr);
    if (found == -1) break;
    switch (found) {
      case 'n':
        atOnce = true;
        break;
      case 'h':
        std::fputs(kHelp, stdout);
        return kDone;
      case 'v':
        std::printf("tavrel-upload %s\n", std::string(version()).c_str());
        return kDone;
      default:
        return refuseArgument("tavrel-upload", word);
    }
  }
  if (optind < argc) return refuseArgument("tavrel-upload", argv[optind]);
  LinuxSystemLog log;
  return loggedStatusOf(log, "upload", [&] { return upload(log, atOnce); });
}

}  // namespace
}  // namespace tavrel::upload

int main(int argc, char** argv) {
  return tavrel::exitStatusOf("tavrel-upload", [&] { return tavrel::upload::run(argc, argv); });
}
