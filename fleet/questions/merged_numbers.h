// The five numbers over the values of many logs, as if one log had counted all of them.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>

#include "fleet/model/log_record.h"
#include "fleet/questions/exact_moments.h"

namespace tavrel::fleet {

/// Whether a merged mean can use these numbers: mean and squared deviations are not finite when a
/// value was not, or when the values lie too far apart.
bool hasMean(const FiveNumbers& numbers);

class MergedNumbers {
 public:
  /// A summary without values changes nothing. One without a mean contributes to
  /// all but mean and deviations.
  void add(const FiveNumbers& numbers);

  /// Five zeros when there are no values, as in a log. The count saturates at 2^64 - 1.
  /// Minimum and maximum are not-a-number only when they are in every log. Mean and squared
  /// deviations are the doubles nearest to the exact results; not-a-number when no summary has
  /// a mean or the count overflows.
  FiveNumbers numbers() const;

  /// Of the values that enter the mean; nothing without a mean.
  std::optional<double> standardDeviation() const;

  std::size_t logsWithoutMean() const { return logsWithoutMean_; }

 private:
  bool isEmpty_ = true;
  double minimum_ = 0;
  double maximum_ = 0;
  std::uint64_t count_ = 0;
  ExactMoments moments_;
  std::size_t logsWithoutMean_ = 0;
};

/// The root of the mean squared deviation; nothing when it is not finite.
std::optional<double> standardDeviation(double squaredDeviations, std::uint64_t values);

}  // namespace tavrel::fleet
