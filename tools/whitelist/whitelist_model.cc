#include "tools/whitelist/whitelist_model.h"

namespace tavrel {

namespace {

// Bytes of a name in a finding's path: a file may repeat a name of one megabyte many times.
constexpr std::size_t kShownNameBytes = 200;

}  // namespace

std::string shownName(std::string_view name) {
  if (name.size() <= kShownNameBytes) return std::string(name);
  return std::string(name.substr(0, kShownNameBytes)) + "...";
}

std::string pathOfRule(const WhitelistRule& rule) {
  std::string path = shownName(rule.group);
  path += '/';
  path += kWhitelistTables[static_cast<std::size_t>(rule.table)];
  path += '/';
  return path += shownName(rule.key);
}

WhitelistModel::WhitelistModel(plist::Value whitelist) : whitelist_(std::move(whitelist)) {
  for (const plist::Entry& group : whitelist_.dictionary()) {
    const plist::Dictionary tables = group.value.dictionary();
    for (std::size_t table = 0; table < kWhitelistTables.size(); ++table) {
      for (const plist::Entry& rule : tables.dictionary(kWhitelistTables[table])) {
        const plist::Dictionary options = rule.value.dictionary();
        if (options)
          rules_[table].push_back(
              {static_cast<WhitelistTable>(table), group.key, rule.key, options});
      }
    }
  }
}

void WhitelistDecisions::buildTrees() {
  for (std::size_t table = 0; table < kWhitelistTables.size(); ++table) {
    if (!isPrefixTable(static_cast<WhitelistTable>(table))) continue;
    std::vector<std::string> prefixes;
    prefixes.reserve(groups_[table].size());
    for (const auto& [prefix, group] : groups_[table])
      prefixes.emplace_back(prefix);
    trees_[table] = PrefixTree(std::move(prefixes));
  }
}

WhitelistDecision WhitelistDecisions::decide(WhitelistTable keys, WhitelistTable prefixes,
                                             std::string_view key) const {
  using Rule = WhitelistDecision::Rule;
  const auto& exact = groups_[static_cast<std::size_t>(keys)];
  if (const auto at = exact.find(key); at != exact.end()) return {Rule::Exact, at->second, {}};

  const auto prefixTable = static_cast<std::size_t>(prefixes);
  if (const auto prefix = trees_[prefixTable].longestMatch(key)) {
    const auto at = groups_[prefixTable].find(*prefix);
    return {Rule::Prefix, at->second, at->first};
  }
  return {isInternalDevice_ ? Rule::Internal : Rule::None, {}, {}};
}

}  // namespace tavrel
