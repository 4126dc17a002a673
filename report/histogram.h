// Histograms over explicit bucket boundaries.
//
// Bucket i counts the values x with b(i-1) < x <= b(i); the last bucket counts values above all
// boundaries, and not-a-number. Boundaries may be in any order: the first one in the list that is
// not less than a value decides.
#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <vector>

#include "base/plist.h"

namespace tavrel {

/// The index of the bucket of `value`, by a walk over boundaries in the order of the whitelist.
std::uint32_t determineHistBucketForValue(double value, const plist::Array& withIntervals);

/// The labels of buckets. Successive rows usually have the same boundaries, so the labels of the
/// last chosen boundaries are kept, and only those.
class HistogramLabels {
 public:
  void choose(const plist::Array& intervals);
  /// The label of a bucket of the chosen boundaries, made on first use.
  const plist::String& of(std::size_t bucket);

 private:
  plist::Array intervals_;  // a copy: the caller's may change
  std::vector<plist::String> labels_;
};

/// Labels and counts of the buckets with a count; an empty handle when all are empty.
plist::Dictionary histogramDictForIntervals(const plist::Array& intervals,
                                            std::span<const std::uint32_t> withHistCounts,
                                            HistogramLabels& labels);
plist::Dictionary histogramDictForIntervals(const plist::Array& intervals,
                                            std::span<const std::uint32_t> withHistCounts);

/// How the line begins that is logged for a key whose histogram cannot be computed; the log then
/// has only its summary.
inline constexpr std::string_view kHistogramLeftOut = "Couldn't allocate histCounts for key ";

/// The counters of one computation. Boundaries are converted once, so that counting a value is a
/// comparison or two.
class Histogram {
 public:
  /// Nothing when there are more boundaries than the limit, or not enough memory.
  static std::optional<Histogram> create(const plist::Array& intervals);

  void count(double value) { ++counts_[bucketOf(value)]; }
  std::span<const std::uint32_t> counts() const { return counts_; }

  /// The same index as from `determineHistBucketForValue`.
  std::uint32_t bucketOf(double value) const {
    // A binary search without branches, since a CPU cannot predict the order of values. The
    // comparison is written so that not-a-number passes every boundary.
    const double* const ends = ends_.data();
    std::size_t passed = 0;
    for (std::size_t step = indexes_.size() / 2; step != 0; step /= 2)
      passed += ends[passed + step - 1] >= value ? 0 : step;
    return indexes_[passed];
  }

 private:
  Histogram() = default;

  // The boundaries that can decide: those above all boundaries before them. They ascend, so a
  // binary search finds the one at which the walk stops. `indexes_` has the index of each in the
  // whitelist's order, and last the index of the bucket above them all. The last index and an
  // infinite boundary, which only not-a-number passes, are repeated until the number of indexes is
  // a power of two.
  std::vector<double> ends_;
  std::vector<std::uint32_t> indexes_;
  std::vector<std::uint32_t> counts_;
};

}  // namespace tavrel
