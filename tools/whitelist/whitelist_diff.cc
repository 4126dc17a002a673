#include "tools/whitelist/whitelist_diff.h"

#include <nlohmann/json.hpp>
#include <ostream>
#include <set>
#include <string_view>

#include "tools/console/json_value.h"
#include "tools/console/table.h"
#include "tools/whitelist/whitelist_coarseness.h"
#include "tools/whitelist/whitelist_model.h"
#include "tools/whitelist/whitelist_rules.h"

namespace tavrel {
namespace {

struct ChangeName {
  const char* title;
  const char* member;
};
constexpr std::array<ChangeName, 4> kChangeNames = {{{"newly leaves", "newly_leaves"},
                                                     {"gets finer", "finer"},
                                                     {"gets coarser", "coarser"},
                                                     {"no longer leaves", "no_longer_leaves"}}};

plist::Dictionary optionsOf(const WhitelistRule* rule) {
  return rule != nullptr ? rule->options : plist::Dictionary();
}

std::set<std::string_view> namesIn(const WhitelistRules::Rules& before,
                                   const WhitelistRules::Rules& after) {
  std::set<std::string_view> names;
  for (const auto* rules : {&before, &after}) {
    for (const auto& [name, rule] : *rules)
      names.insert(name);
  }
  return names;
}

void compare(const ChangedRule& rule, WhitelistChanges& changes) {
  const auto file = [&](WhitelistChange change) {
    changes[static_cast<std::size_t>(change)].push_back(rule);
  };
  if (!rule.before && !rule.after) return;
  if (!rule.before) return file(WhitelistChange::NewlyLeaves);
  if (!rule.after) return file(WhitelistChange::NoLongerLeaves);
  const Coarseness coarseness = rule.isDistribution ? compareIntervals(rule.before, rule.after)
                                                    : compareRounding(rule.before, rule.after);
  if (coarseness.isFiner) return file(WhitelistChange::Finer);
  if (coarseness.isCoarser) return file(WhitelistChange::Coarser);
}

void compareKind(const WhitelistModel& before, const WhitelistModel& after, bool isDistribution,
                 WhitelistChanges& changes) {
  const WhitelistRules old(before, isDistribution);
  const WhitelistRules fresh(after, isDistribution);
  for (const std::string_view key : namesIn(old.keys(), fresh.keys())) {
    compare({isDistribution, false, std::string(key), optionsOf(old.ofKey(key)),
             optionsOf(fresh.ofKey(key))},
            changes);
  }
  for (const std::string_view prefix : namesIn(old.prefixes(), fresh.prefixes())) {
    compare({isDistribution, true, std::string(prefix), optionsOf(old.ofKeysBeginningWith(prefix)),
             optionsOf(fresh.ofKeysBeginningWith(prefix))},
            changes);
  }
}

std::string effectText(const ChangedRule& rule) {
  const auto text = [&](const plist::Dictionary& options) {
    return optionsText(options, !rule.isDistribution);
  };
  if (!rule.before) return text(rule.after);
  if (!rule.after) return "was: " + text(rule.before);
  return text(rule.before) + " -> " + text(rule.after);
}

}  // namespace

WhitelistChanges compareWhitelists(const plist::Value& before, const plist::Value& after) {
  const WhitelistModel old(before);
  const WhitelistModel fresh(after);
  WhitelistChanges changes;
  for (const bool isDistribution : {false, true})
    compareKind(old, fresh, isDistribution, changes);
  return changes;
}

bool revealsMore(const WhitelistChanges& changes) {
  return !changes[static_cast<std::size_t>(WhitelistChange::NewlyLeaves)].empty() ||
         !changes[static_cast<std::size_t>(WhitelistChange::Finer)].empty();
}

void printChanges(std::ostream& out, const WhitelistChanges& changes) {
  bool isFirst = true;
  for (std::size_t i = 0; i < changes.size(); ++i) {
    if (changes[i].empty()) continue;
    out << (isFirst ? "" : "\n") << kChangeNames[i].title << " (" << changes[i].size() << ")\n";
    isFirst = false;
    for (const ChangedRule& rule : changes[i]) {
      out << (rule.isDistribution ? "  distribution" : "  scalar") << (rule.isPrefix ? "s " : " ")
          << printable(rule.key) << (rule.isPrefix ? "*: " : ": ") << printable(effectText(rule))
          << '\n';
    }
  }
  if (isFirst) out << "no change in what leaves\n";
}

Json jsonOf(const WhitelistChanges& changes) {
  Json object = Json::object();
  const auto jsonOfOptions = [](const plist::Dictionary& options) {
    return options ? jsonOf(plist::Value(options)) : Json(nullptr);
  };
  for (std::size_t i = 0; i < changes.size(); ++i) {
    Json list = Json::array();
    for (const ChangedRule& rule : changes[i]) {
      list.push_back({{"kind", rule.isDistribution ? "distribution" : "scalar"},
                      {rule.isPrefix ? "prefix" : "key", rule.key},
                      {"old", jsonOfOptions(rule.before)},
                      {"new", jsonOfOptions(rule.after)}});
    }
    object[kChangeNames[i].member] = std::move(list);
  }
  return object;
}

}  // namespace tavrel
