// A clock that stands still: 2026-11-27 18:02:18.25 UTC until it is set.
#pragma once

#include "platform/clock.h"

namespace tavrel {

class FixedClock final : public Clock {
 public:
  plist::Date now() override { return time; }
  std::uint64_t ticks() override { return 0; }
  std::optional<TimeBase> timeBase() override { return TimeBase{1, 1}; }

  plist::Date time = plist::Date::since1970(1'795'802'538.25);
};

}  // namespace tavrel
