// The rules that decide about one kind of statistics on a device that is not internal,
// with all groups switched on.
#pragma once

#include <string_view>
#include <unordered_map>

#include "config/prefix_tree.h"
#include "tools/whitelist/whitelist_model.h"

namespace tavrel {

/// The model must outlive it.
class WhitelistRules {
 public:
  using Rules = std::unordered_map<std::string_view, const WhitelistRule*>;

  /// `isDistribution` selects the rules of distributions; otherwise those of scalars.
  WhitelistRules(const WhitelistModel& model, bool isDistribution);

  /// Null when the key does not leave the device.
  const WhitelistRule* ofKey(std::string_view key) const;
  /// For keys that begin with `prefix` but neither are listed nor begin with a longer prefix.
  const WhitelistRule* ofKeysBeginningWith(std::string_view prefix) const;

  /// By key, and by prefix.
  const Rules& keys() const { return keys_; }
  const Rules& prefixes() const { return prefixes_; }

 private:
  Rules keys_;
  Rules prefixes_;
  PrefixTree tree_;
};

}  // namespace tavrel
