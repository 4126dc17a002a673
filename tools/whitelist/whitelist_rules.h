// The rules that decide about one kind of statistics.
#pragma once

#include <functional>
#include <string_view>
#include <unordered_map>

#include "config/prefix_tree.h"
#include "tools/whitelist/whitelist_model.h"

namespace tavrel {

/// Whether a device that is not internal loads a group of this name when all are switched on.
bool isLoadedByDefault(std::string_view group);

/// The model must outlive it.
class WhitelistRules {
 public:
  using Rules = std::unordered_map<std::string_view, const WhitelistRule*>;
  /// Whether the rules of a group of this name count.
  using IsLoaded = std::function<bool(std::string_view group)>;

  /// `isDistribution` selects the rules of distributions; otherwise those of scalars.
  WhitelistRules(const WhitelistModel& model, bool isDistribution,
                 const IsLoaded& isLoaded = isLoadedByDefault);

  /// Null when no rule names the key. Takes time that does not depend on the number of rules.
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
