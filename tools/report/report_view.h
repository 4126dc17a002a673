// Shows report channels and their values to people.
#pragma once

#include <cstddef>
#include <iosfwd>
#include <optional>

#include "base/plist.h"

namespace tavrel {

/// A tree by driver, group and subgroup, or with `flat` a table with one line per channel.
void printChannels(std::ostream& out, const plist::Dictionary& channels, bool flat,
                   std::optional<std::size_t> columns);

/// The values of sampled channels. Counts of a delta are differences, and may be negative.
void printSamples(std::ostream& out, const plist::Dictionary& samples, bool isDelta,
                  std::optional<std::size_t> columns);

}  // namespace tavrel
