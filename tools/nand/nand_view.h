// The NAND information for people: geometry, wear, traffic, write amplification, histograms.
#pragma once

#include <cstddef>
#include <iosfwd>
#include <optional>

#include "base/plist.h"

namespace tavrel {

/// Everything that the dictionary holds, in groups; keys without their common prefix. What belongs
/// to no group stands in the last one. Figures that follow from several others (capacity, write
/// amplification) say from which.
void printNandInfo(std::ostream& out, const plist::Dictionary& info,
                   std::optional<std::size_t> columns);

}  // namespace tavrel
