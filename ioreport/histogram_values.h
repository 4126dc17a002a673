// The values of histogram channels, one element per bucket. sample_values.h says what accessors
// return for a channel of another format and an index out of range.
#pragma once

#include <cstdint>

#include "base/kernel_return.h"
#include "base/plist.h"

namespace tavrel {

/// From the channel's type, whether it is sampled or not.
std::int32_t IOReportHistogramGetBucketCount(const plist::Dictionary& channel);

std::int64_t IOReportHistogramGetBucketHits(const plist::Dictionary& channel, std::int32_t bucket);
std::int64_t IOReportHistogramGetBucketMinValue(const plist::Dictionary& channel,
                                                std::int32_t bucket);
std::int64_t IOReportHistogramGetBucketMaxValue(const plist::Dictionary& channel,
                                                std::int32_t bucket);
std::int64_t IOReportHistogramGetBucketSum(const plist::Dictionary& channel, std::int32_t bucket);

/// Of all buckets that have hits: the minimum of the first, the maximum of the last.
std::int64_t IOReportHistogramGetMinValue(const plist::Dictionary& channel);
std::int64_t IOReportHistogramGetMaxValue(const plist::Dictionary& channel);

/// A bucket takes the values above its lower bound up to its upper one. The bounds are worked out
/// from the channel's configuration once and kept in the channel. Either out-argument may be null.
KernelReturn IOReportHistogramGetBucketBounds(const plist::Dictionary& channel, std::int32_t bucket,
                                              std::int64_t* lowerBound, std::int64_t* upperBound);

}  // namespace tavrel
