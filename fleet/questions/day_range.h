// The days that a question covers, and how people write them.
#pragma once

#include <cstdint>
#include <limits>
#include <string>
#include <string_view>

#include "base/expected.h"

namespace tavrel::fleet {

/// Days since 1970 UTC, both included.
struct DayRange {
  std::int32_t first = std::numeric_limits<std::int32_t>::min();
  std::int32_t last = std::numeric_limits<std::int32_t>::max();

  bool contains(std::int32_t day) const { return first <= day && day <= last; }
  bool overlaps(const DayRange& other) const { return first <= other.last && other.first <= last; }
  bool operator==(const DayRange&) const = default;
};

/// "2026-11-01..2026-11-07"; "all days" for a range without ends.
std::string textOf(const DayRange& days);

/// Reads "FIRST..LAST" or one day, each as "YYYY-MM-DD" (either end of a range may be left out), or
/// a count of days up to `newest`. The error says what is wrong with the text.
Expected<DayRange> parseDayRange(std::string_view text, std::int32_t newest);

}  // namespace tavrel::fleet
