// Shows report channels and their values to people.
#pragma once

#include "base/plist.h"
#include "tools/console/page.h"

namespace tavrel {

/// Prints a tree by driver, group and subgroup or, with `flat`, a table with one line per channel.
void printChannels(const Page& page, const plist::Dictionary& channels, bool flat);

/// Prints the values of sampled channels in familiar units. Counts of a delta are
/// differences and may be negative.
void printSamples(const Page& page, const plist::Dictionary& samples, bool isDelta);

}  // namespace tavrel
