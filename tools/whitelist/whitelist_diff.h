// What changes in the statistics that leave a device when one whitelist replaces another.
//
// Both are compared as an ordinary (not internal) device uses them, with all groups switched
// on: for each key that either of them lists, and for all other keys that begin with a prefix
// that either of them lists.
#pragma once

#include <array>
#include <cstdint>
#include <iosfwd>
#include <string>
#include <vector>

#include "base/plist.h"
#include "tools/console/tool_output.h"

namespace tavrel {

/// In order of importance to somebody who reviews a change.
enum class WhitelistChange : std::uint8_t { NewlyLeaves, Finer, Coarser, NoLongerLeaves };

struct ChangedRule {
  bool isDistribution = false;
  bool isPrefix = false;
  std::string key;           // or a prefix
  plist::Dictionary before;  // options; an empty handle when the statistics do not leave
  plist::Dictionary after;
};

/// Indexed by WhitelistChange. Options both finer and coarser in some respect count as finer.
using WhitelistChanges = std::array<std::vector<ChangedRule>, 4>;

WhitelistChanges compareWhitelists(const plist::Value& before, const plist::Value& after);

/// Whether anything newly leaves or gets finer.
bool revealsMore(const WhitelistChanges& changes);

void printChanges(std::ostream& out, const WhitelistChanges& changes);
Json jsonOf(const WhitelistChanges& changes);

}  // namespace tavrel
