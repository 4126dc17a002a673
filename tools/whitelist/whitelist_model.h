// The whitelist as its author wrote it: each rule with its group and table.
//
// The daemon keeps only the union of the groups. This model keeps the origin of each rule, so that
// the tool can say which rule decides and which have no effect.
//
//   const WhitelistModel model(*decoded);
//   const WhitelistRules scalars(model, false, isLoaded);  // tools/whitelist/whitelist_rules.h
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
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

}  // namespace tavrel
