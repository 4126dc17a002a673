#include "ioreport/histogram_values.h"

#include "ioreport/allocation.h"
#include "ioreport/channel.h"
#include "ioreport/elements.h"
#include "ioreport/keys.h"

namespace tavrel {
namespace {

// A segment of a bucket configuration: 16 bytes, little-endian; the word at offset 8 is ignored.
constexpr std::size_t kSegmentBytes = 16;
constexpr std::size_t kSegmentBase = 0;
constexpr std::size_t kSegmentIsExponential = 4;
constexpr std::size_t kSegmentBucketCount = 12;

// The upper bounds of all buckets; an empty handle when they do not ascend, beginning above 0, or
// are more than `largestCount`.
plist::Array bucketBounds(ByteSpan configuration, std::size_t largestCount) {
  const std::size_t segments = configuration.size() / kSegmentBytes;
  if (segments == 0) return {};
  plist::Array bounds = plist::Array::create();
  std::uint64_t previous = 0;
  for (std::size_t segment = 0; segment < segments; ++segment) {
    const std::size_t at = segment * kSegmentBytes;
    const std::uint32_t base = *loadLittle32(configuration, at + kSegmentBase);
    const bool isExponential = *loadLittle32(configuration, at + kSegmentIsExponential) != 0;
    const auto count =
        static_cast<std::int32_t>(*loadLittle32(configuration, at + kSegmentBucketCount));
    std::uint64_t power = 1;
    std::uint32_t multiple = 0;
    for (std::int32_t bucket = 0; bucket < count; ++bucket) {
      power *= base;
      multiple += base;
      const std::uint64_t bound = isExponential ? power : multiple;
      if (bound <= previous || bounds.size() == largestCount) return {};
      bounds.append(static_cast<std::int64_t>(bound));
      previous = bound;
    }
  }
  return bounds;
}

// The bounds of a channel, computed once and cached in it.
plist::Array processedBounds(plist::Dictionary channel) {
  const std::int32_t count = IOReportHistogramGetBucketCount(channel);
  if (!channel.contains(kProcessedConfigKey) && count >= 0) {
    const plist::Data configuration = channel.dictionary(kChannelInfoKey).data(kChannelConfigKey);
    channel.set(kProcessedConfigKey,
                bucketBounds(configuration.bytes(), static_cast<std::size_t>(count)));
  }
  return channel.array(kProcessedConfigKey);
}

}  // namespace

std::int32_t IOReportHistogramGetBucketCount(const plist::Dictionary& channel) {
  return elementCountFor(channel, kFormatHistogram);
}

std::int64_t IOReportHistogramGetBucketHits(const plist::Dictionary& channel, std::int32_t bucket) {
  return elementValue(channel, kFormatHistogram, bucket, kBucketHits);
}

std::int64_t IOReportHistogramGetBucketMinValue(const plist::Dictionary& channel,
                                                std::int32_t bucket) {
  return elementValue(channel, kFormatHistogram, bucket, kBucketMinimum);
}

std::int64_t IOReportHistogramGetBucketMaxValue(const plist::Dictionary& channel,
                                                std::int32_t bucket) {
  return elementValue(channel, kFormatHistogram, bucket, kBucketMaximum);
}

std::int64_t IOReportHistogramGetBucketSum(const plist::Dictionary& channel, std::int32_t bucket) {
  return elementValue(channel, kFormatHistogram, bucket, kBucketSum);
}

std::int64_t IOReportHistogramGetMinValue(const plist::Dictionary& channel) {
  const Elements buckets = elementsOfType(channel, kFormatHistogram);
  for (std::size_t i = 0; i < buckets.count(); ++i) {
    if (buckets.value(i, kBucketHits) != 0) return buckets.value(i, kBucketMinimum);
  }
  return kInvalidValue;
}

std::int64_t IOReportHistogramGetMaxValue(const plist::Dictionary& channel) {
  const Elements buckets = elementsOfType(channel, kFormatHistogram);
  for (std::size_t i = buckets.count(); i-- > 0;) {
    if (buckets.value(i, kBucketHits) != 0) return buckets.value(i, kBucketMaximum);
  }
  return kInvalidValue;
}

KernelReturn IOReportHistogramGetBucketBounds(const plist::Dictionary& channel, std::int32_t bucket,
                                              std::int64_t* lowerBound, std::int64_t* upperBound) {
  const plist::Array bounds = madeOrNull([&] { return processedBounds(channel); });
  if (bucket < 0 || static_cast<std::size_t>(bucket) >= bounds.size()) return kKernelError;
  const auto index = static_cast<std::size_t>(bucket);
  const plist::Value lower = index == 0 ? plist::Value(0) : bounds.at(index - 1);
  const plist::Value upper = bounds.at(index);
  if (!lower.number() || !upper.number()) return kKernelError;
  if (lowerBound) *lowerBound = lower.number()->int64();
  if (upperBound) *upperBound = upper.number()->int64();
  return kKernelSuccess;
}

}  // namespace tavrel
