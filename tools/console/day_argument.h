// Days the way people write and read them.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "base/civil_time.h"
#include "base/expected.h"

namespace tavrel {

/// Reads a day number or "YYYY-MM-DD". When `today` is given, "today" and "yesterday" work as well.
/// The error says what is wrong with the text.
Expected<std::int32_t> parseDay(std::string_view text,
                                std::optional<std::int32_t> today = std::nullopt);

/// "2026-11-16", for any day number.
inline std::string dayDateText(std::int32_t day) {
  return dateText(civilFromDays(day));
}

/// "20773 (2026-11-16)", the form in which days are shown.
std::string dayText(std::int32_t day);

}  // namespace tavrel
