// How much the options of a whitelist coarsen what leaves the device.
#pragma once

#include <string>

#include "base/plist.h"

namespace tavrel {

/// Compares later options with earlier ones. Both are true when one is finer and another coarser.
struct Coarseness {
  bool isFiner = false;
  bool isCoarser = false;
};

/// Compares the rounding of scalars: the width of buckets and the number of significant figures.
Coarseness compareRounding(const plist::Dictionary& before, const plist::Dictionary& after);

/// Compares the histograms of distributions. A boundary missing from the earlier options is finer.
Coarseness compareIntervals(const plist::Dictionary& before, const plist::Dictionary& after);

/// Whether every scalar is reported exactly, without a bucket width of 1 to
/// show that this is intended.
bool coarsensNoScalar(const plist::Dictionary& options);

/// The options that affect a kind of statistics, as readable text.
std::string optionsText(const plist::Dictionary& options, bool isScalar);

}  // namespace tavrel
