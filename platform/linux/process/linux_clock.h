// The machine's clocks.
//
// Ticks are nanoseconds of CLOCK_BOOTTIME: they count from the start of the device and continue
// during suspension, in which a wearable spends most of its time.
#pragma once

#include "platform/clock.h"

namespace tavrel {

class LinuxClock final : public Clock {
 public:
  plist::Date now() override;
  std::uint64_t ticks() override;
  std::optional<TimeBase> timeBase() override;
};

}  // namespace tavrel
