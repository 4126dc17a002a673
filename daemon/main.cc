#include <cstddef>
#include <exception>
#include <span>

#include "daemon/entry.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/linux_system_log.h"

// The exit status is 0 whatever happened: nobody restarts the daemon, the next day does.
int main(int argc, char** argv) {
  using namespace tavrel;
  try {
    LinuxPlatform linuxPlatform(DeviceRoot::fromEnvironment());
    return runTavrel(linuxPlatform.platform(),
                     std::span<const char* const>(argv, static_cast<std::size_t>(argc)));
  } catch (const std::exception& error) {
    LinuxSystemLog().log(LogLevel::Error, "run ended early: %s", error.what());
  }
  return 0;
}
