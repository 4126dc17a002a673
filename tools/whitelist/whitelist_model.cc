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

}  // namespace tavrel
