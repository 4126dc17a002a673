// Finds whatever in a whitelist would not do what its author may expect.
#pragma once

#include <string>
#include <vector>

#include "base/plist.h"

namespace tavrel {

/// A fault at one place in the whitelist.
struct WhitelistFinding {
  std::string path;  // "Group/ScalarKeys/key/sig_fig"; empty for the whole file
  std::string message;
};

/// First everything that the daemon would ignore, that has a wrong type, or that lets statistics
/// out uncoarsened; then keys in several groups and prefixes that hide others. At most
/// `limits::kWhitelistFindings`, plus one that counts the rest.
std::vector<WhitelistFinding> checkWhitelist(const plist::Value& whitelist);

}  // namespace tavrel
