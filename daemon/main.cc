#include <csignal>
#include <cstddef>
#include <exception>
#include <fcntl.h>
#include <span>
#include <unistd.h>
#include <utility>

#include "daemon/entry.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/system_log/linux_system_log.h"

namespace {

/// The run must go on when the reader of standard error has gone. A log line must not end up in a
/// data file that got the number of a standard stream closed at the start.
void secureStandardStreams() {
  std::signal(SIGPIPE, SIG_IGN);
  int descriptor = 0;
  while (descriptor >= 0 && descriptor <= STDERR_FILENO)
    descriptor = open("/dev/null", O_RDWR);
  if (descriptor >= 0) close(descriptor);
}

}  // namespace

// The exit status is always 0: a failed run is not restarted, the next day runs again.
int main(int argc, char** argv) {
  using namespace tavrel;
  secureStandardStreams();
  try {
    DeviceRoot root = DeviceRoot::fromEnvironment();
    if (const Status usable = root.check(); !usable) {
      LinuxSystemLog().log(LogLevel::Error, "%s: name the device's folder with TAVREL_ROOT",
                           usable.error().message);
      return 0;
    }
    LinuxPlatform linuxPlatform(std::move(root));
    return runTavrel(linuxPlatform.platform(),
                     std::span<const char* const>(argv, static_cast<std::size_t>(argc)));
  } catch (const std::exception& error) {
    LinuxSystemLog().log(LogLevel::Error, "run ended early: %s", error.what());
  }
  return 0;
}
