#include "report/histogram.h"

#include <limits>
#include <new>

#include "base/format.h"
#include "base/limits.h"

namespace tavrel {
namespace {

constexpr double kInfinity = std::numeric_limits<double>::infinity();
constexpr double kNotANumber = std::numeric_limits<double>::quiet_NaN();

// A boundary that is not a number stops no value.
double boundaryOf(const plist::Value& value) {
  const auto number = value.number();
  return number ? number->real() : kNotANumber;
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

plist::Dictionary histogramDictForIntervals(const plist::Array& intervals,
                                            std::span<const std::uint32_t> withHistCounts) {
  const std::size_t boundaries = intervals.size();
  if (boundaries >= std::numeric_limits<std::uint32_t>::max()) return {};
  plist::Dictionary histogram;
  for (std::size_t i = 0; i <= boundaries; ++i) {
    if (withHistCounts[i] == 0) continue;
    const plist::Value lower = i == 0 ? plist::Value(-kInfinity) : intervals.at(i - 1);
    const std::string label = i == boundaries ? format("(%@, %@)", lower, plist::Value(kInfinity))
                                              : format("(%@, %@]", lower, intervals.at(i));
    histogram.set(label, withHistCounts[i]);
  }
  return histogram;
}

std::optional<Histogram> Histogram::create(const plist::Array& intervals) {
  if (intervals.size() > limits::kHistogramBoundaries) return std::nullopt;
  Histogram histogram;
  try {
    histogram.counts_.resize(intervals.size() + 1);
    histogram.ends_.reserve(intervals.size());
    histogram.indexes_.reserve(intervals.size() + 1);
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
  histogram.indexes_.push_back(index);
  return histogram;
}

// Halving without branches: a CPU cannot predict the order of values. The comparisons are written
// so that not-a-number passes every boundary.
std::uint32_t Histogram::bucketOf(double value) const {
  const double* first = ends_.data();
  std::size_t count = ends_.size();
  while (count > 1) {
    const std::size_t half = count / 2;
    first = first[half - 1] >= value ? first : first + half;
    count -= half;
  }
  auto passed = static_cast<std::size_t>(first - ends_.data());
  if (count == 1 && !(*first >= value)) ++passed;
  return indexes_[passed];
}

}  // namespace tavrel
