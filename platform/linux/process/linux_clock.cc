#include "platform/linux/process/linux_clock.h"

#include <time.h>

namespace tavrel {

plist::Date LinuxClock::now() {
  timespec now{};
  clock_gettime(CLOCK_REALTIME, &now);
  return plist::Date::since1970(static_cast<double>(now.tv_sec) +
                                static_cast<double>(now.tv_nsec) * 1e-9);
}

std::uint64_t LinuxClock::ticks() {
  timespec now{};
  if (clock_gettime(CLOCK_BOOTTIME, &now) != 0) clock_gettime(CLOCK_MONOTONIC, &now);
  return static_cast<std::uint64_t>(now.tv_sec) * 1'000'000'000U +
         static_cast<std::uint64_t>(now.tv_nsec);
}

std::optional<Clock::TimeBase> LinuxClock::timeBase() {
  return TimeBase{1, 1};
}

}  // namespace tavrel
