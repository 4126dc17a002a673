#include "tools/whitelist/whitelist_rules.h"

#include <string>
#include <utility>
#include <vector>

#include "config/bh_config.h"

namespace tavrel {
namespace {

WhitelistRules::Rules rulesOf(const WhitelistModel& model, WhitelistTable table,
                              const WhitelistRules::IsLoaded& isLoaded) {
  WhitelistRules::Rules rules;
  for (const WhitelistRule& rule : model.rules(table)) {
    if (isLoaded(rule.group)) rules[rule.key] = &rule;
  }
  return rules;
}

}  // namespace

bool isLoadedByDefault(std::string_view group) {
  return group != kInternalTestingGroup;
}

WhitelistRules::WhitelistRules(const WhitelistModel& model, bool isDistribution,
                               const IsLoaded& isLoaded)
    : keys_(rulesOf(model,
                    isDistribution ? WhitelistTable::DistributionKeys : WhitelistTable::ScalarKeys,
                    isLoaded)),
      prefixes_(rulesOf(
          model,
          isDistribution ? WhitelistTable::DistributionPrefixes : WhitelistTable::ScalarPrefixes,
          isLoaded)) {
  std::vector<std::string> prefixes;
  prefixes.reserve(prefixes_.size());
  for (const auto& [prefix, rule] : prefixes_)
    prefixes.emplace_back(prefix);
  tree_ = PrefixTree(std::move(prefixes));
}

const WhitelistRule* WhitelistRules::ofKey(std::string_view key) const {
  const auto exact = keys_.find(key);
  return exact != keys_.end() ? exact->second : ofKeysBeginningWith(key);
}

const WhitelistRule* WhitelistRules::ofKeysBeginningWith(std::string_view prefix) const {
  const auto longest = tree_.longestMatch(prefix);
  return longest ? prefixes_.find(*longest)->second : nullptr;
}

}  // namespace tavrel
