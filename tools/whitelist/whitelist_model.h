// The whitelist as its author wrote it: each rule with its group and table.
//
// The daemon keeps only the union of the groups. This model keeps the origin of each rule, so that
// the tool can say which rule decides and which have no effect.
//
//   const WhitelistModel model(*decoded);
//   const WhitelistDecisions decisions(model, isInternal, isLoaded);
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "base/plist.h"
#include "config/bh_config.h"

namespace tavrel {

/// The table of a rule, in the order of `kWhitelistTables`.
enum class WhitelistTable : std::uint8_t {
  ScalarKeys,
  ScalarPrefixes,
  DistributionKeys,
  DistributionPrefixes,
};

inline constexpr std::array kWhitelistTables = {kScalarKeysTable, kScalarPrefixesTable,
                                                kDistributionKeysTable, kDistributionPrefixesTable};

constexpr bool isPrefixTable(WhitelistTable table) {
  return table == WhitelistTable::ScalarPrefixes || table == WhitelistTable::DistributionPrefixes;
}
constexpr bool isDistributionTable(WhitelistTable table) {
  return table == WhitelistTable::DistributionKeys || table == WhitelistTable::DistributionPrefixes;
}

struct WhitelistRule {
  WhitelistTable table;
  std::string_view group;
  std::string_view key;  // or a prefix
  plist::Dictionary options;
};

/// The place of a rule in the file, as findings show it: "Group/ScalarKeys/key".
/// Long names are shortened.
std::string pathOfRule(const WhitelistRule& rule);
std::string shownName(std::string_view name);

class WhitelistModel {
 public:
  /// Ignores rules whose type prevents loading.
  explicit WhitelistModel(plist::Value whitelist);

  /// The rules of a table in the order in which the daemon loads them.
  const std::vector<WhitelistRule>& rules(WhitelistTable table) const {
    return rules_[static_cast<std::size_t>(table)];
  }

 private:
  plist::Value whitelist_;  // keeps what the rules borrow
  std::array<std::vector<WhitelistRule>, kWhitelistTables.size()> rules_;
};

/// What the whitelist decides about one key.
struct WhitelistDecision {
  enum class Rule : std::uint8_t { None, Exact, Prefix, Internal };
  Rule rule = Rule::None;
  std::string_view group;  // of the rule; empty for `None` and `Internal`
  std::string_view prefix;
};

/// Finds the rule that decides about a key, in time that does not depend on the number of rules.
/// The model must outlive it.
class WhitelistDecisions {
 public:
  /// `isLoaded` says whether the daemon loads a group of this name.
  template <class IsLoaded>
  WhitelistDecisions(const WhitelistModel& model, bool isInternalDevice, IsLoaded isLoaded)
      : isInternalDevice_(isInternalDevice) {
    for (std::size_t table = 0; table < kWhitelistTables.size(); ++table) {
      for (const WhitelistRule& rule : model.rules(static_cast<WhitelistTable>(table))) {
        if (isLoaded(rule.group)) groups_[table][rule.key] = rule.group;
      }
    }
    buildTrees();
  }

  WhitelistDecision decide(WhitelistTable keys, WhitelistTable prefixes,
                           std::string_view key) const;

 private:
  void buildTrees();

  bool isInternalDevice_;
  std::array<std::unordered_map<std::string_view, std::string_view>, kWhitelistTables.size()>
      groups_;  // by key or prefix: the group that decides
  std::array<PrefixTree, kWhitelistTables.size()> trees_;  // of the prefix tables
};

}  // namespace tavrel
