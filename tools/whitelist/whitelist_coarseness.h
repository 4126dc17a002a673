// How coarse the options of a whitelist make what leaves.
#pragma once

#include <string>

#include "base/plist.h"

namespace tavrel {

/// Of later options beside earlier ones. Both hold when one option is finer and another coarser.
struct Coarseness {
  bool isFiner = false;
  bool isCoarser = false;
};

/// Compares the rounding of scalars: the width of buckets and the number of significant figures.
Coarseness compareRounding(const plist::Dictionary& before, const plist::Dictionary& after);

/// Compares the histograms of distributions. A boundary that the earlier options lack is finer.
Coarseness compareIntervals(const plist::Dictionary& before, const plist::Dictionary& after);

/// Whether every scalar is reported as it is, without a bucket width of 1 to say that this is
/// meant.
bool coarsensNoScalar(const plist::Dictionary& options);

/// The options that affect a kind of statistics, for people.
std::string optionsText(const plist::Dictionary& options, bool isScalar);

}  // namespace tavrel
