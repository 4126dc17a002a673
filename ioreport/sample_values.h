// Reading the values of a sampled channel: a single one, or arrays of them.
//
//   std::int64_t unit = kInvalidValue;
//   const std::int64_t reads = IOReportSimpleGetIntegerValue(channel, &unit);
//   if (reads != kInvalidValue) ...
//
// Every accessor, including those of histograms and states, checks that the channel has its format
// and that the index is in range. Otherwise it returns a fixed value: `kInvalidValue` for values
// and IDs, -1 for counts and indexes, not-a-number for a duty cycle, nothing for a name. No
// accessor copies elements.
#pragma once

#include <cstdint>

#include "base/plist.h"

namespace tavrel {

/// `unit`, when given, is written only when there is a value.
std::int64_t IOReportSimpleGetIntegerValue(const plist::Dictionary& channel,
                                           std::int64_t* unit = nullptr);

std::int64_t IOReportArrayGetValueAtIndex(const plist::Dictionary& channel, std::int32_t index);

}  // namespace tavrel
