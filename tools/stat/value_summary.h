// Figures that summarise many values without keeping them.
//
//   Summary summary;
//   forEachValue([&](double value) { summary.add(value); });
//   PercentileSearch search(summary.numbers(), kPercents);
//   while (search.needsPass()) {
//     forEachValue([&](double v) { search.add(v); });
//     search.endPass();
//   }
//
// Values that are not numbers are counted and otherwise ignored.
#pragma once

#include <cstdint>
#include <span>
#include <vector>

#include "tools/shared/distribution_view.h"

namespace tavrel {

class Summary {
 public:
  void add(double value);

  /// All values.
  std::int64_t count() const { return numbers_ + notNumbers_; }
  /// Values that are numbers, including infinities. Without any, the other figures are undefined.
  std::int64_t numbers() const { return numbers_; }
  std::int64_t notNumbers() const { return notNumbers_; }
  double minimum() const { return minimum_; }
  double maximum() const { return maximum_; }
  /// Infinite when a value is; not-a-number when both infinities occur.
  double mean() const;
  /// The root of the mean squared deviation; not-a-number when a value is infinite.
  double standardDeviation() const;

  /// About the finite values. Without any, the other figures are undefined.
  bool hasFinite() const { return finite_ > 0; }
  double lowest() const { return lowest_; }
  double highest() const { return highest_; }
  /// Whether all of them are whole numbers.
  bool areWhole() const { return areWhole_; }

 private:
  std::int64_t numbers_ = 0;
  std::int64_t notNumbers_ = 0;
  double minimum_ = 0;
  double maximum_ = 0;
  // About the finite values:
  std::int64_t finite_ = 0;
  double lowest_ = 0;
  double highest_ = 0;
  bool areWhole_ = true;
  double mean_ = 0;
  double squaredDeviations_ = 0;
};

/// Finds exact percentiles in four passes over the same values, 16 bits of each value per pass. The
/// p-th percentile is the smallest value that at least p percent of the values do not exceed.
class PercentileSearch {
 public:
  /// `numbers` is how many of the values are numbers.
  PercentileSearch(std::int64_t numbers, std::span<const int> percents);

  bool needsPass() const { return bitsKnown_ < 64 && !wanted_.empty(); }
  void add(double value);
  void endPass();

  /// In the order of the percents; empty when there are no numbers.
  std::vector<double> values() const;

 private:
  // The percentiles whose upper bits are the same so far.
  struct Branch {
    std::uint64_t upperBits;
    std::vector<std::int64_t> counts;  // by the next 16 bits
  };
  struct Wanted {
    std::int64_t rank;  // from 0, among the values with these upper bits
    std::uint64_t upperBits;
  };

  void beginPass();

  int bitsKnown_ = 0;
  std::vector<Wanted> wanted_;
  std::vector<Branch> branches_;
};

/// Counts values in at most a dozen buckets "(a, b]" of equal width whose bounds are round numbers.
/// Infinities have buckets of their own.
class RoundHistogram {
 public:
  explicit RoundHistogram(const Summary& summary);

  void add(double value);
  std::vector<DistributionView::Bucket> buckets() const;

 private:
  double lowest_;
  double highest_;
  double width_ = 0;  // 0 when one bucket holds all finite values
  double first_ = 0;  // the lowest bucket is (first_ * width_, (first_ + 1) * width_]
  std::vector<std::uint64_t> counts_;
  std::uint64_t below_ = 0;
  std::uint64_t above_ = 0;
};

}  // namespace tavrel
