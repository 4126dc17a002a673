#include "fleet/questions/merged_numbers.h"

#include <cmath>

namespace tavrel::fleet {

namespace {

/// Negative zero is less than zero, or the result would depend on the order.
bool isLess(double a, double b) {
  return a < b || (a == b && std::signbit(a) && !std::signbit(b));
}

}  // namespace

void MergedNumbers::add(const FiveNumbers& numbers) {
  if (numbers.count == 0) return;
  const bool isFirst = moments_.count() == 0;
  if (isFirst || std::isnan(minimum_) || isLess(numbers.minimum, minimum_)) {
    minimum_ = numbers.minimum;
  }
  if (isFirst || std::isnan(maximum_) || isLess(maximum_, numbers.maximum)) {
    maximum_ = numbers.maximum;
  }
  moments_.add(numbers.mean, numbers.squaredDeviations, numbers.count);
}

FiveNumbers MergedNumbers::numbers() const {
  if (moments_.count() == 0) return {};
  return {minimum_, maximum_, moments_.mean(), moments_.squaredDeviations(), moments_.count()};
}

std::optional<double> standardDeviation(const FiveNumbers& numbers) {
  const double variance = numbers.squaredDeviations / static_cast<double>(numbers.count);
  if (!(variance >= 0) || std::isinf(variance)) return std::nullopt;
  return std::sqrt(variance);
}

}  // namespace tavrel::fleet
