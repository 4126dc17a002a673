// Coarsening of scalars: bucket width first, then significant figures.
#pragma once

#include <cstdint>

#include "base/plist.h"

namespace tavrel {

/// `value` to the nearest multiple of `width`, halves upwards; negative values move toward zero.
/// A width of 0 leaves the value alone.
std::int64_t roundToBucket(std::int64_t value, std::uint32_t width);

/// `value` with at most `figures` significant figures, halves away from zero.
std::int64_t roundToSignificantFigures(std::int64_t value, std::uint32_t figures);

/// `value` as the options of its key ask. An option that is not a number is passed over.
std::int64_t coarsened(std::int64_t value, const plist::Dictionary& options);

}  // namespace tavrel
