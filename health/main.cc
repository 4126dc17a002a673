// tavrel-health: reads the health of all drives once, with only the rights that this needs.
#include <cstdio>
#include <string>
#include <string_view>

#include "base/instant.h"
#include "base/program.h"
#include "base/version.h"
#include "platform/guarded.h"
#include "platform/linux/health/reader.h"
#include "platform/linux/process/linux_clock.h"
#include "platform/linux/system_log/linux_system_log.h"

namespace tavrel {
namespace {

constexpr const char* kHelp =
    "Usage: tavrel-health [--help | --version]\n"
    "Reads the health of all drives once and leaves the readings in /run/tavrel/health/.\n"
    "\n"
    "\"tavrelctl disks\" shows the readings. See tavrel-health(8).\n";

// The exit status. With any other argument no drive is touched.
int answer(const char* given) {
  const std::string_view argument = given;
  if (argument == "--help" || argument == "-h") {
    std::fputs(kHelp, stdout);
  } else if (argument == "--version") {
    std::printf("tavrel-health %s\n", std::string(version()).c_str());
  } else {
    return refuseArgument("tavrel-health", given);
  }
  return 0;
}

// Exit status 1 when a reading or the memory could not be written. For a drive that cannot be
// read, the reading says so.
int readDrives(SystemLog& log) {
  const DeviceRoot root = DeviceRoot::fromEnvironment();
  if (const Status usable = root.check(); !usable) {
    log.write(LogLevel::Error, usable.error().message);
    return 1;
  }
  FileSystem files;
  health::LinuxDeviceCommands commands;
  health::HealthReader reader(root, files, commands, log);
  return reader.readAll(wholeSeconds(LinuxClock().now())) ? 0 : 1;
}

}  // namespace
}  // namespace tavrel

int main(int argc, char** argv) {
  return tavrel::exitStatusOf("tavrel-health", [&] {
    if (argc > 1) return tavrel::answer(argv[1]);
    tavrel::LinuxSystemLog log;
    return tavrel::loggedStatusOf(log, "reading of drives",
                                  [&] { return tavrel::readDrives(log); });
  });
}
