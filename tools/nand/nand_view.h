// Shows the NAND information to people: geometry, wear, traffic, write amplification, histograms.
#pragma once

#include "base/plist.h"
#include "tools/shared/page.h"

namespace tavrel {

/// What the dictionary holds, in groups; keys without their common prefix. What belongs to no group
/// stands in the last one. Figures that follow from several others (capacity, write amplification)
/// say from which. Without `showsZeros` one line counts the figures that are 0.
void printNandInfo(const Page& page, const plist::Dictionary& info, bool showsZeros);

}  // namespace tavrel
