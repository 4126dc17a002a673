// The five numbers of the values of many logs, as if one log had counted them all.
#pragma once

#include <cstdint>
#include <optional>

#include "fleet/model/log_record.h"
#include "fleet/questions/exact_moments.h"

namespace tavrel::fleet {

class MergedNumbers {
 public:
  /// A summary without values changes nothing.
  void add(const FiveNumbers& numbers);

  /// Five zeros without values, as in a log. The count stays at 2^64 - 1 when there are more.
  /// Minimum and maximum are not-a-number only when they are in every log. Mean and squared
  /// deviations are the doubles nearest to the exact ones; not-a-number and infinities in them are
  /// described at ExactMoments.
  FiveNumbers numbers() const;

 private:
  double minimum_ = 0;
  double maximum_ = 0;
  ExactMoments moments_;
};

/// The root of the mean squared deviation; nothing when that is no number.
std::optional<double> standardDeviation(const FiveNumbers& numbers);

}  // namespace tavrel::fleet
