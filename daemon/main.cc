#include <chrono>
#include <csignal>
#include <cstddef>
#include <cstdio>
#include <exception>
#include <fcntl.h>
#include <span>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>
#include <utility>

#include "base/activated_descriptors.h"
#include "daemon/entry.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/process/linux_clock.h"
#include "platform/linux/runs/run_memory.h"
#include "platform/linux/system_log/linux_system_log.h"

namespace {

/// The run must go on when the reader of standard error has gone. And if a standard stream is
/// closed at the start, no data file may take its number and receive log lines.
void secureStandardStreams() {
  std::signal(SIGPIPE, SIG_IGN);
  int descriptor = 0;
  while (descriptor >= 0 && descriptor <= STDERR_FILENO)
    descriptor = open("/dev/null", O_RDWR);
  if (descriptor >= 0) close(descriptor);
}

// A log line needs memory, of which there may be none left.
void tellEnd(const std::exception& error) {
  try {
    tavrel::LinuxSystemLog().log(tavrel::LogLevel::Error, "run ended early: %s", error.what());
  } catch (const std::exception&) {
    std::fputs("tavrel: run ended early: out of memory\n", stderr);
  }
}

/// How long a service that cannot work waits before it ends, as in tavrel.service after a failed
/// start.
constexpr std::chrono::seconds kPauseOfService{30};

/// Clients still wait for the socket that the service manager passed: it starts the next process as
/// soon as this one ends.
void pauseIfActivated() {
  if (tavrel::activatedDescriptors(getpid()) > 0) std::this_thread::sleep_for(kPauseOfService);
}

/// False when the run could not begin or was cut short.
bool run(std::span<const char* const> arguments) {
  using namespace tavrel;
  try {
    DeviceRoot root = DeviceRoot::fromEnvironment();
    if (const Status usable = root.check(); !usable) {
      LinuxSystemLog().write(LogLevel::Error, usable.error().message);
      return false;
    }
    LinuxSystemLog systemLog;
    LinuxClock clock;
    RunMemory memory(root, clock, systemLog, runKindOf(arguments));
    bool isWhole = false;
    try {
      // Inside the try block, because its destructor writes the run's changes, which may fail too.
      LinuxPlatform linuxPlatform(std::move(root), {.log = &memory});
      runTavrel(linuxPlatform.platform(), arguments);
      isWhole = true;
    } catch (const std::exception& error) {
      memory.log(LogLevel::Error, "run ended early: %s", error.what());
    }
    memory.finish();
    return isWhole;
  } catch (const std::exception& error) {
    tellEnd(error);
    return false;
  }
}

}  // namespace

// The exit status is always 0: a failed run must not be restarted; there is another run the next
// day.
int main(int argc, char** argv) {
  umask(022);  // the modes of files must not depend on who starts a run
  secureStandardStreams();
  if (!run({argv, static_cast<std::size_t>(argc)})) pauseIfActivated();
  return 0;
}
