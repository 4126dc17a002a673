// Chooses histogram buckets for the values of a scalar across devices.
#pragma once

#include <cstdint>
#include <span>
#include <vector>

#include "fleet/questions/histogram.h"

namespace tavrel::fleet {

/// Boundaries at round numbers (1, 2 or 5 times a power of ten apart) that divide the middle
/// 90 percent of the values into about ten buckets, with a few more on each side.
/// `ascending` must not be empty.
std::vector<double> roundBoundaries(std::span<const std::int64_t> ascending);

/// The bucket of a value: above one boundary, up to and including the next.
Cell bucketOf(std::span<const double> boundaries, std::int64_t value);

}  // namespace tavrel::fleet
