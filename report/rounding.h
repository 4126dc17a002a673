// Coarsening of scalars: bucket width first, then significant figures.
#pragma once

#include <cstdint>

#include "base/plist.h"

namespace tavrel {

/// Rounds to the nearest multiple of `width`, halves upwards; negative values move toward zero. A
/// width of 0 leaves the value unchanged.
std::int64_t roundToBucket(std::int64_t value, std::uint32_t width);

/// Rounds to at most `figures` significant figures, halves away from zero.
std::int64_t roundToSignificantFigures(std::int64_t value, std::uint32_t figures);

/// Rounds as the key's options say. An option that is not a number is skipped.
std::int64_t coarsened(std::int64_t value, const plist::Dictionary& options);

}  // namespace tavrel
