#include "fleet/questions/merged_numbers.h"

#include <cmath>

#include "base/arithmetic.h"

namespace tavrel::fleet {

namespace {

/// Negative zero is less than zero; otherwise the result would depend on the order.
bool isLess(double a, double b) {
  return a < b || (a == b && std::signbit(a) && !std::signbit(b));
}

}  // namespace

bool hasMean(const FiveNumbers& numbers) {
  return std::isfinite(numbers.mean) && std::isfinite(numbers.squaredDeviations);
}

void MergedNumbers::add(const FiveNumbers& numbers) {
  if (numbers.count == 0) return;
  if (isEmpty_ || std::isnan(minimum_) || isLess(numbers.minimum, minimum_)) {
    minimum_ = numbers.minimum;
  }
  if (isEmpty_ || std::isnan(maximum_) || isLess(maximum_, numbers.maximum)) {
    maximum_ = numbers.maximum;
  }
  isEmpty_ = false;
  count_ = saturatingAdd(count_, numbers.count);
  if (hasMean(numbers)) {
    moments_.add(numbers.mean, numbers.squaredDeviations, numbers.count);
  } else {
    ++logsWithoutMean_;
  }
}

FiveNumbers MergedNumbers::numbers() const {
  if (isEmpty_) return {};
  return {minimum_, maximum_, moments_.mean(), moments_.squaredDeviations(), count_};
}

std::optional<double> MergedNumbers::standardDeviation() const {
  return fleet::standardDeviation(moments_.squaredDeviations(), moments_.count());
}

std::optional<double> standardDeviation(double squaredDeviations, std::uint64_t values) {
  const double variance = squaredDeviations / static_cast<double>(values);
  if (!(variance >= 0) || std::isinf(variance)) return std::nullopt;
  return std::sqrt(variance);
}

}  // namespace tavrel::fleet
