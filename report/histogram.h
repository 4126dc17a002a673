// Histograms over explicit bucket boundaries.
//
// Bucket i counts the values x with b(i-1) < x <= b(i); the last one counts those above all
// boundaries, and not-a-number. Boundaries may be in any order: the first one in the list that is
// not less than a value decides.
#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "base/plist.h"

namespace tavrel {

/// The index of the bucket of `value`, by a walk over boundaries in the order of the whitelist.
std::uint32_t determineHistBucketForValue(double value, const plist::Array& withIntervals);

/// Labels and counts of the buckets that counted something; an empty handle when none did.
plist::Dictionary histogramDictForIntervals(const plist::Array& intervals,
                                            std::span<const std::uint32_t> withHistCounts);

/// The counters of one computation. Boundaries are converted once, so that counting a value is a
/// comparison or two.
class Histogram {
 public:
  /// Nothing when there are more boundaries than the limit, or memory is short.
  static std::optional<Histogram> create(const plist::Array& intervals);

  void count(double value) { ++counts_[bucketOf(value)]; }
  std::span<const std::uint32_t> counts() const { return counts_; }

  /// The index that `determineHistBucketForValue` gives.
  std::uint32_t bucketOf(double value) const;

 private:
  Histogram() = default;

  // The boundaries that can decide: those above all boundaries before them. They ascend, so that a
  // search by halving finds the one at which the walk stops. `indexes_` has the position of each in
  // the whitelist, and last the index of the bucket above all.
  std::vector<double> ends_;
  std::vector<std::uint32_t> indexes_;
  std::vector<std::uint32_t> counts_;
};

}  // namespace tavrel
