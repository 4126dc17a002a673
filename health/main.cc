// tavrel-health: reads the health of all drives once, with only the rights that this needs.
#include <cstdio>
#include <exception>

#include "base/arithmetic.h"
#include "platform/linux/health/reader.h"
#include "platform/linux/process/linux_clock.h"
#include "platform/linux/system_log/linux_system_log.h"

// Exits with 1 when a reading or the memory could not be written. For a drive that cannot be
// read, the reading says so.
int main() try {
  using namespace tavrel;
  LinuxSystemLog log;
  try {
    const DeviceRoot root = DeviceRoot::fromEnvironment();
    if (const Status usable = root.check(); !usable) {
      log.log(LogLevel::Error, "%s: name the device's folder with TAVREL_ROOT",
              usable.error().message);
      return 1;
    }
    FileSystem files;
    health::LinuxDeviceCommands commands;
    health::HealthReader reader(root, files, commands, log);
    return reader.readAll(saturatingInt64(LinuxClock().now().secondsSince1970())) ? 0 : 1;
  } catch (const std::exception& error) {
    log.log(LogLevel::Error, "reading of drives ended early: %s", error.what());
  }
  return 1;
} catch (const std::exception&) {
  // A formatted message would take memory, and none is left.
  std::fputs("tavrel-health: out of memory\n", stderr);
  return 1;
}
