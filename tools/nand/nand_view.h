// Shows the NAND information to people: geometry, wear, traffic, write amplification, histograms.
#pragma once

#include <cstddef>
#include <iosfwd>
#include <optional>

#include "base/plist.h"

namespace tavrel {

/// Everything in the dictionary, in groups, the last one for all other keys; keys lack their common
/// prefix. Figures that follow from others (capacity, write amplification) say from which.
void printNandInfo(std::ostream& out, const plist::Dictionary& info,
                   std::optional<std::size_t> columns);

}  // namespace tavrel
