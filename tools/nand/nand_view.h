// Shows the NAND information to people: geometry, wear, traffic, write amplification, histograms.
#pragma once

#include "base/plist.h"
#include "tools/console/page.h"

namespace tavrel {

/// Prints the dictionary in groups; keys lack their common prefix. The last group has whatever
/// belongs to no other. Figures computed from several others (capacity, write amplification) name
/// these. Without `showsZeros`, one line counts the figures that are 0.
void printNandInfo(const Page& page, const plist::Dictionary& info, bool showsZeros);

}  // namespace tavrel
