// Instants as text for file names and for people, in UTC.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "base/plist.h"

namespace tavrel {

/// "20261116T180218Z", for file names.
std::string compactStamp(plist::Date instant);

/// The UTC day, since 1970, of a text that begins with such a stamp.
std::optional<std::int64_t> dayInStamp(std::string_view stamp);

/// "2026-11-16T18:02:18.123Z", milliseconds cut off.
std::string preciseStamp(plist::Date instant);

}  // namespace tavrel
