// The values of histogram channels, one element per bucket. See sample_values.h for the results for
// a channel of another format or an index out of range.
#pragma once

#include <cstdint>

#include "base/kernel_return.h"
#include "base/plist.h"

namespace tavrel {

/// The number of buckets in the channel's type, whether or not it is sampled.
std::int32_t IOReportHistogramGetBucketCount(const plist::Dictionary& channel);

std::int64_t IOReportHistogramGetBucketHits(const plist::Dictionary& channel, std::int32_t bucket);
std::int64_t IOReportHistogramGetBucketMinValue(const plist::Dictionary& channel,
                                                std::int32_t bucket);
std::int64_t IOReportHistogramGetBucketMaxValue(const plist::Dictionary& channel,
                                                std::int32_t bucket);
std::int64_t IOReportHistogramGetBucketSum(const plist::Dictionary& channel, std::int32_t bucket);

/// The minimum of the first bucket with hits, and the maximum of the last.
std::int64_t IOReportHistogramGetMinValue(const plist::Dictionary& channel);
std::int64_t IOReportHistogramGetMaxValue(const plist::Dictionary& channel);

/// A bucket counts values above its lower bound, up to and including its upper one. The bounds are
/// computed once from the channel's configuration and cached in the channel. Either out-argument
/// may be null.
KernelReturn IOReportHistogramGetBucketBounds(const plist::Dictionary& channel, std::int32_t bucket,
                                              std::int64_t* lowerBound, std::int64_t* upperBound);

}  // namespace tavrel
