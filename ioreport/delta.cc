#include "ioreport/delta.h"

#include "base/arithmetic.h"
#include "ioreport/allocation.h"
#include "ioreport/channel.h"
#include "ioreport/elements.h"
#include "ioreport/iteration.h"
#include "ioreport/keys.h"
#include "ioreport/sample_values.h"

namespace tavrel {
namespace {

// The error of a delta when values are missing.
constexpr KernelReturn kMissingValues = 1;

/// The elements of one channel in both samples, and the place for their difference.
struct Triple {
  Elements previous;
  Elements current;
  Elements result;

  bool isInvalid(std::size_t element, std::size_t index) const {
    return previous.value(element, index) == kInvalidValue ||
           current.value(element, index) == kInvalidValue;
  }
  std::int64_t difference(std::size_t element, std::size_t index) const {
    return wrappingSubtract(current.value(element, index), previous.value(element, index));
  }
};

bool subtractState(const Triple& states, std::size_t i) {
  for (const std::size_t index : {kStateInTransitions, kStateResidency}) {
    if (states.isInvalid(i, index)) return false;
    states.result.setValue(i, index, states.difference(i, index));
  }
  return true;
}

// The sum of a bucket without new values is meaningless, and before the first value it is unset.
bool subtractBucket(const Triple& buckets, std::size_t i) {
  if (buckets.isInvalid(i, kBucketHits)) return false;
  const std::int64_t hits = buckets.difference(i, kBucketHits);
  buckets.result.setValue(i, kBucketHits, hits);
  std::int64_t sum = kInvalidValue;
  if (hits != 0) {
    sum = buckets.current.value(i, kBucketSum);
    if (sum == kInvalidValue) return false;
    if (buckets.previous.value(i, kBucketHits) != 0) {
      if (buckets.isInvalid(i, kBucketSum)) return false;
      sum = buckets.difference(i, kBucketSum);
    }
  }
  buckets.result.setValue(i, kBucketSum, sum);
  return true;
}

bool subtractArrayElement(const Triple& array, std::size_t i) {
  for (std::size_t index = 0; index < kElementValues; ++index) {
    if (array.previous.value(i, index) == kInvalidValue) continue;
    array.result.setValue(i, index,
                          array.current.value(i, index) == kInvalidValue
                              ? array.previous.value(i, index)
                              : array.difference(i, index));
  }
  return true;
}

KernelReturn subtractSimple(const plist::Dictionary& previous, const plist::Dictionary& current,
                            const Elements& result) {
  const std::int64_t before = IOReportSimpleGetIntegerValue(previous);
  const std::int64_t now = IOReportSimpleGetIntegerValue(current);
  if (before == kInvalidValue || now == kInvalidValue || result.count() != 1) return kKernelError;
  result.setValue(0, kSimpleValue, wrappingSubtract(now, before));
  return kKernelSuccess;
}

KernelReturn subtractElements(const Triple& elements,
                              bool (*subtract)(const Triple&, std::size_t)) {
  if (!elements.current || !elements.result ||
      elements.current.count() != elements.result.count()) {
    return kMissingValues;
  }
  elements.result.copyFrom(elements.current);
  for (std::size_t i = 0; i < elements.result.count(); ++i) {
    if (!subtract(elements, i)) return kMissingValues;
  }
  return kKernelSuccess;
}

// Returns only a code, because no text describes these failures.
KernelReturn subtract(std::uint8_t format, const plist::Dictionary& previous,
                      const plist::Dictionary& current, const plist::Dictionary& result) {
  if (format == kFormatSimple) {
    return subtractSimple(previous, current, getRawElements(result, format));
  }
  const Elements previousElements = elementsOfType(previous, format);
  const Elements currentElements = elementsOfType(current, format);
  if (format == kFormatSimpleArray) {
    return subtractElements({previousElements, currentElements, getRawElements(result, format)},
                            subtractArrayElement);
  }
  return subtractElements({previousElements, currentElements, elementsOfType(result, format)},
                          format == kFormatState ? subtractState : subtractBucket);
}

}  // namespace

KernelReturn computeDelta(const plist::Dictionary& previous, const plist::Dictionary& current,
                          const plist::Dictionary& result, ErrorOut error) {
  const std::uint8_t before = IOReportChannelGetFormat(previous);
  const std::uint8_t now = IOReportChannelGetFormat(current);
  if (before == kFormatUnknown || now == kFormatUnknown) {
    return fail(error, kKernelBadArgument, nullptr);
  }
  if (before != now) return fail(error, kKernelBadArgument, "mismatched formats");
  if (now > kFormatSimpleArray) {
    return fail(error, kKernelUnsupportedMode, "unknown report format");
  }
  const KernelReturn code = subtract(now, previous, current, result);
  return code == kKernelSuccess ? code : fail(error, code, nullptr);
}

plist::Dictionary IOReportSampleCreateDelta(const plist::Dictionary& previous,
                                            const plist::Dictionary& current, ErrorOut error) {
  plist::Dictionary result = madeOrNull([&] { return plist::mutableCopy(previous); });
  // The result needs elements of its own: those of the previous sample must not be written. Without
  // elements, the computation fails.
  if (cloneElements(result, previous, 0) != kKernelSuccess) result.remove(kRawElementsKey);
  return computeDelta(previous, current, result, error) == kKernelSuccess ? result
                                                                          : plist::Dictionary();
}

plist::Dictionary IOReportCreateSamplesDelta(const plist::Dictionary& previous,
                                             const plist::Dictionary& current, ErrorOut error) {
  return compareAggregates(previous, current,
                           [&](const plist::Dictionary& match, const plist::Dictionary& channel,
                               plist::Dictionary& newChannel) -> IterateResult {
                             const KernelReturn code =
                                 computeDelta(match, channel, newChannel, error);
                             return code == kKernelSuccess ? kIterateContinue : kIterateStop;
                           });
}

}  // namespace tavrel
