#include "report/histogram.h"

#include <algorithm>
#include <bit>
#include <limits>
#include <new>

#include "base/format.h"
#include "base/limits.h"

namespace tavrel {
namespace {

constexpr double kInfinity = std::numeric_limits<double>::infinity();
constexpr double kNotANumber = std::numeric_limits<double>::quiet_NaN();

// A boundary of another type becomes not-a-number, which no value stops at.
double boundaryOf(const plist::Value& value) {
  const auto number = value.number();
  return number ? number->real() : kNotANumber;
}

// Whether labels certainly show both boundaries in the same way.
bool printAlike(const plist::Value& a, const plist::Value& b) {
  const auto left = a.number();
  const auto right = b.number();
  return left && right && left->kind() == right->kind() && left->int64() == right->int64() &&
         std::bit_cast<std::uint64_t>(left->real()) == std::bit_cast<std::uint64_t>(right->real());
}

}  // namespace

std::uint32_t determineHistBucketForValue(double value, const plist::Array& withIntervals) {
  std::uint32_t index = 0;
  for (const plist::Value& boundary : withIntervals) {
    if (boundaryOf(boundary) >= value) break;
    ++index;
  }
  return index;
}

void HistogramLabels::choose(const plist::Array& intervals) {
  if (intervals_ && std::ranges::equal(intervals_, intervals, printAlike)) return;
  labels_.assign(intervals.size() + 1, {});
  intervals_ = plist::mutableCopy(intervals);
}

const plist::String& HistogramLabels::of(std::size_t bucket) {
  plist::String& label = labels_[bucket];
  if (!label.view().empty()) return label;
  const plist::Value lower = bucket == 0 ? plist::Value(-kInfinity) : intervals_.at(bucket - 1);
  label = bucket == intervals_.size() ? format("(%@, %@)", lower, plist::Value(kInfinity))
                                      : format("(%@, %@]", lower, intervals_.at(bucket));
  return label;
}

plist::Dictionary histogramDictForIntervals(const plist::Array& intervals,
                                            std::span<const std::uint32_t> withHistCounts,
                                            HistogramLabels& labels) {
  const std::size_t boundaries = intervals.size();
  if (boundaries >= std::numeric_limits<std::uint32_t>::max()) return {};
  labels.choose(intervals);
  const auto counts = withHistCounts.first(boundaries + 1);
  const auto counted = static_cast<std::size_t>(
      std::ranges::count_if(counts, [](auto count) { return count != 0; }));
  if (counted == 0) return {};
  plist::Dictionary histogram = plist::Dictionary::create(counted);
  for (std::size_t i = 0; i <= boundaries; ++i) {
    if (counts[i] != 0) histogram.set(labels.of(i), counts[i]);
  }
  return histogram;
}

plist::Dictionary histogramDictForIntervals(const plist::Array& intervals,
                                            std::span<const std::uint32_t> withHistCounts) {
  HistogramLabels labels;
  return histogramDictForIntervals(intervals, withHistCounts, labels);
}

std::optional<Histogram> Histogram::create(const plist::Array& intervals) {
  if (intervals.size() > limits::kHistogramBoundaries) return std::nullopt;
  Histogram histogram;
  try {
    histogram.counts_.resize(intervals.size() + 1);
    histogram.ends_.reserve(std::bit_ceil(intervals.size() + 1));
    histogram.indexes_.reserve(std::bit_ceil(intervals.size() + 1));
  } catch (const std::bad_alloc&) {
    return std::nullopt;
  }
  std::uint32_t index = 0;
  for (const plist::Value& value : intervals) {
    const double boundary = boundaryOf(value);
    const bool decides =
        histogram.ends_.empty() ? boundary == boundary : boundary > histogram.ends_.back();
    if (decides) {
      histogram.ends_.push_back(boundary);
      histogram.indexes_.push_back(index);
    }
    ++index;
  }
  const std::size_t room = std::bit_ceil(histogram.ends_.size() + 1);
  histogram.indexes_.resize(room, index);
  histogram.ends_.resize(room - 1, kInfinity);
  return histogram;
}

}  // namespace tavrel
