#include "fleet/logs/five_numbers_check.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <limits>

namespace tavrel::fleet {
namespace {

bool same(double a, double b) {
  return a == b || (std::isnan(a) && std::isnan(b));
}

}  // namespace

const char* faultOf(const FiveNumbers& n) {
  if (n.count > std::uint64_t{std::numeric_limits<std::int32_t>::max()}) {
    return "its count exceeds 31 bits";
  }
  if (n.count == 0) {
    const bool isZero = n.minimum == 0 && n.maximum == 0 && n.mean == 0 && n.squaredDeviations == 0;
    return isZero ? nullptr : "its count is 0, and the other numbers are not";
  }
  if (std::isnan(n.minimum) != std::isnan(n.maximum)) {
    return "only one of its minimum and maximum is not a number";
  }
  if (n.minimum > n.maximum) return "its minimum is above its maximum";
  // Minus infinity follows from a difference beyond the range of a double, as does the mean then.
  const bool isOverflow = std::isinf(n.squaredDeviations) && std::isinf(n.mean);
  if (n.squaredDeviations < 0 && !isOverflow) return "its deviations are negative";
  if (n.count == 1) {
    const bool isOneValue =
        same(n.minimum, n.maximum) && same(n.minimum, n.mean) && n.squaredDeviations == 0;
    return isOneValue ? nullptr : "its count is 1, and its numbers are not those of one value";
  }
  if (std::isfinite(n.mean)) {
    // The running mean of finite values never leaves their range, however it is rounded.
    if (!(n.minimum <= n.mean && n.mean <= n.maximum)) {
      return "its mean is not between minimum and maximum";
    }
    if (std::isnan(n.squaredDeviations)) {
      return "its deviations are not a number, but its mean is";
    }
    // They are largest when each value is the minimum or the maximum; rounding may add to that.
    const double most = static_cast<double>(n.count) * (n.maximum - n.mean) * (n.mean - n.minimum);
    const double size = std::max(std::abs(n.minimum), std::abs(n.maximum));
    const double margin = static_cast<double>(n.count) *
                              (1e-6 * size * size + std::numeric_limits<double>::denorm_min()) +
                          1e-6 * most;
    return n.squaredDeviations > most + margin ? "its deviations are larger than its range allows"
                                               : nullptr;
  }
  if (std::isnan(n.mean)) {
    return std::isnan(n.squaredDeviations) ? nullptr
                                           : "its mean is not a number, but its deviations are";
  }
  // An infinite mean stems from infinite values, or from a difference beyond the range of a double.
  return std::isfinite(n.maximum - n.minimum) ? "its mean is infinite, and its values are not"
                                              : nullptr;
}

}  // namespace tavrel::fleet
