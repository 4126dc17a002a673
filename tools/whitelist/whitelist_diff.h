// What changes for the statistics of a device when one whitelist replaces another.
//
// Both are compared as a device that is not internal uses them, with all groups switched on: for
// each key that one of them lists, and for all other keys that begin with a prefix that one of them
// lists.
#pragma once

#include <array>
#include <cstdint>
#include <iosfwd>
#include <string>
#include <vector>

#include "base/plist.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

/// In the order in which they matter to somebody who reviews a change.
enum class WhitelistChange : std::uint8_t { NewlyLeaves, Finer, Coarser, NoLongerLeaves };

struct ChangedRule {
  bool isDistribution = false;
  bool isPrefix = false;
  std::string key;           // or prefix
  plist::Dictionary before;  // options; an empty handle when the statistics do not leave
  plist::Dictionary after;
};

/// By change. Options that are finer in one respect and coarser in another count as finer.
using WhitelistChanges = std::array<std::vector<ChangedRule>, 4>;

WhitelistChanges compareWhitelists(const plist::Value& before, const plist::Value& after);

/// Whether anything newly leaves or gets finer.
bool revealsMore(const WhitelistChanges& changes);

void printChanges(std::ostream& out, const WhitelistChanges& changes);
Json jsonOf(const WhitelistChanges& changes);

}  // namespace tavrel
