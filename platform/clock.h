// Wall clock and tick counter. The wall clock says which day it is, and may jump. Measure durations
// with ticks.
#pragma once

#include <cstdint>
#include <optional>

#include "base/plist.h"

namespace tavrel {

class Clock {
 public:
  /// Nanoseconds per tick, as a fraction.
  struct TimeBase {
    std::uint32_t numerator;
    std::uint32_t denominator;
  };

  virtual ~Clock() = default;

  virtual plist::Date now() = 0;

  /// Ticks since the device started.
  virtual std::uint64_t ticks() = 0;
  /// Nothing when it cannot be read.
  virtual std::optional<TimeBase> timeBase() = 0;
};

}  // namespace tavrel
