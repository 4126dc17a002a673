// Reads the values of a sampled channel.
//
//   std::int64_t unit = kInvalidValue;
//   const std::int64_t reads = IOReportSimpleGetIntegerValue(channel, &unit);
//   if (reads != kInvalidValue) ...
//
// Each accessor checks that the channel has its format and the index is in range, and returns a
// fixed value when not: `kInvalidValue` for values and ids, -1 for counts and indexes, not-a-number
// for a duty cycle, nothing for a name. None of them copies.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

#include "base/kernel_return.h"
#include "base/plist.h"

namespace tavrel {

// -- A single value, and arrays of values -------------------------------------------------------

/// `unit`, when given, is written only when there is a value.
std::int64_t IOReportSimpleGetIntegerValue(const plist::Dictionary& channel,
                                           std::int64_t* unit = nullptr);

std::int64_t IOReportArrayGetValueAtIndex(const plist::Dictionary& channel, std::int32_t index);

// -- Histograms: one element per bucket ---------------------------------------------------------

/// From the channel's type, whether it is sampled or not.
std::int32_t IOReportHistogramGetBucketCount(const plist::Dictionary& channel);

std::int64_t IOReportHistogramGetBucketHits(const plist::Dictionary& channel, std::int32_t bucket);
std::int64_t IOReportHistogramGetBucketMinValue(const plist::Dictionary& channel,
                                                std::int32_t bucket);
std::int64_t IOReportHistogramGetBucketMaxValue(const plist::Dictionary& channel,
                                                std::int32_t bucket);
std::int64_t IOReportHistogramGetBucketSum(const plist::Dictionary& channel, std::int32_t bucket);

/// Over all buckets with hits: the minimum of the first, the maximum of the last.
std::int64_t IOReportHistogramGetMinValue(const plist::Dictionary& channel);
std::int64_t IOReportHistogramGetMaxValue(const plist::Dictionary& channel);

/// A bucket takes the values above its lower bound up to its upper one. The bounds are computed
/// from the channel's configuration once and cached in the channel. Either out-argument may be
/// null.
KernelReturn IOReportHistogramGetBucketBounds(const plist::Dictionary& channel, std::int32_t bucket,
                                              std::int64_t* lowerBound, std::int64_t* upperBound);

// -- States: one element per state --------------------------------------------------------------

/// From the channel's type, whether it is sampled or not.
std::int32_t IOReportStateGetCount(const plist::Dictionary& channel);

std::int64_t IOReportStateGetIDForIndex(const plist::Dictionary& channel, std::int32_t index);
/// The last state that has the id.
std::int32_t IOReportStateGetIndexForID(const plist::Dictionary& channel, std::int64_t stateID);

/// The name that the state's id spells, borrowed from the channel, which caches the names of all
/// its states. Nothing when one of them has no name.
std::optional<std::string_view> IOReportStateGetNameForIndex(const plist::Dictionary& channel,
                                                             std::int32_t index);

/// How often the state was entered.
std::int64_t IOReportStateGetInTransitions(const plist::Dictionary& channel, std::int32_t index);
/// How long it lasted in all, unsigned, in the channel's unit.
std::int64_t IOReportStateGetResidency(const plist::Dictionary& channel, std::int32_t index);
/// Its residency as a fraction of that of all states.
double IOReportStateGetDutyCycle(const plist::Dictionary& channel, std::int32_t index);
/// The state whose element has the latest timestamp, the first of them; -1 when none has any.
std::int32_t IOReportStateGetCurrent(const plist::Dictionary& channel);

}  // namespace tavrel
