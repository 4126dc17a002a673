#include "fleet/questions/scalar_histogram.h"

#include <algorithm>
#include <cmath>
#include <limits>

namespace tavrel::fleet {

namespace {

// Exact, for whole numbers as boundaries: not every value has a double.
bool isBelow(double boundary, std::int64_t value) {
  if (boundary < -0x1p63) return true;
  return boundary < 0x1p63 && static_cast<std::int64_t>(boundary) < value;
}

}  // namespace

std::vector<double> roundBoundaries(std::span<const std::int64_t> ascending) {
  constexpr double kBuckets = 10;
  constexpr double kBeyond = 3;  // buckets on each side
  const auto at = [&](unsigned percent) {
    return static_cast<double>(
        ascending[static_cast<std::size_t>(nearestRank(ascending.size(), percent)) - 1]);
  };
  const double low = at(5);
  const double high = at(95);

  double step = 1;
  const double wanted = (high - low) / kBuckets;
  double power = 1;
  while (step < wanted) {
    for (const double factor : {1.0, 2.0, 5.0, 10.0}) {
      step = factor * power;
      if (step >= wanted) break;
    }
    power *= 10;
  }
  std::vector<double> boundaries;
  // No bucket lies entirely outside the range of the values.
  const auto smallest = static_cast<double>(ascending.front());
  const auto largest = static_cast<double>(ascending.back());
  const double first = std::max(std::floor(low / step) - kBeyond, std::floor(smallest / step));
  const double last = std::min(std::ceil(high / step) + kBeyond, std::ceil(largest / step));
  const int steps = static_cast<int>(last - first);
  for (int i = 0; i <= steps; ++i) {
    const double boundary = (first + i) * step;
    // Beyond 2^53, neighbouring multiples can be the same number.
    if (boundaries.empty() || boundaries.back() < boundary) boundaries.push_back(boundary);
  }
  return boundaries;
}

Cell bucketOf(std::span<const double> boundaries, std::int64_t value) {
  constexpr double kInfinity = std::numeric_limits<double>::infinity();
  const auto upper = std::lower_bound(boundaries.begin(), boundaries.end(), value, isBelow);
  Cell bucket{-kInfinity, kInfinity, 1};
  if (upper != boundaries.begin()) bucket.lower = *(upper - 1);
  if (upper != boundaries.end()) bucket.upper = *upper;
  return bucket;
}

}  // namespace tavrel::fleet
