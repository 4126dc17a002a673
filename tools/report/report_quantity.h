// Channel values in familiar units.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "base/plist.h"
#include "ioreport/elements.h"

namespace tavrel {

/// A figure in bytes, degrees Celsius ("°C") or an unprefixed SI unit.
struct ConvertedValue {
  double value;
  std::string_view unit;
};

/// Converts `value` from its channel's unit. Nothing for counts, and for units
/// that cannot be converted.
std::optional<ConvertedValue> convertedValue(const plist::Dictionary& channel, std::int64_t value);

/// The total of which each state has a share. 0, which leaves all without one, when the change of a
/// state is negative: its counter started over.
std::uint64_t residencyToShare(const Elements& states, bool isDelta);

/// "309.7 GiB", "41.3 °C", "12.5 ms".
std::string textOf(const ConvertedValue& converted);

}  // namespace tavrel
