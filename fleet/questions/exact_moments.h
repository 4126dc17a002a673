// The mean and the squared deviations of many values, or of many summaries of values, exactly.
//
// Sums are exact and are rounded only when a result is read: results are the doubles nearest to the
// true values, whatever the order of the terms.
#pragma once

#include <cstddef>
#include <cstdint>

#include "fleet/questions/wide_sum.h"

namespace tavrel::fleet {

class ExactMoments {
 public:
  /// Adds `count` values with this mean, whose squared deviations from it sum to
  /// `squaredDeviations`. Both must be finite.
  void add(double mean, double squaredDeviations, std::uint64_t count);
  void add(double value) { add(value, 0, 1); }
  void add(std::int64_t value);

  /// Saturates at 2^64 - 1.
  std::uint64_t count() const { return count_; }

  /// The mean of all values. Not-a-number without values, or when the count overflowed.
  double mean() const;

  /// The mean of `after`'s values less that of `before`'s, rounded once. Not-a-number when one of
  /// the means is, or when there are 2^64 pairs of values.
  static double differenceOfMeans(const ExactMoments& before, const ExactMoments& after);

  /// The sum of squared deviations from `mean()`, not divided by the count. Not-a-number when the
  /// mean is.
  double squaredDeviations() const;

 private:
  // The lowest bit of the sum is worth the smallest double; that of the sum of squares, its square.
  static constexpr int kLastBit = -1074;
  static constexpr std::size_t kSumLimbs = 34;      // magnitude below 2^(1024 + 64)
  static constexpr std::size_t kSquaresLimbs = 67;  // below 2^(2048 + 64)

  bool grow(std::uint64_t count);
  void addTerm(std::uint64_t mantissa, int exponent, bool isNegative, std::uint64_t count);

  WideSum<kSumLimbs> sum_;
  WideSum<kSquaresLimbs> squares_;  // also the squared deviations of summaries
  std::uint64_t count_ = 0;
  bool overflowed_ = false;
};

}  // namespace tavrel::fleet
