#include "fleet/loading/permitted_keys.h"

#include <vector>

#include "base/format.h"
#include "base/limits.h"
#include "base/plist.h"
#include "base/text.h"
#include "config/bh_config.h"
#include "fleet/sources/sources.h"
#include "platform/linux/files/digests.h"
#include "platform/plist/coding.h"
#include "platform/tallied_log.h"

namespace tavrel::fleet {
namespace {

constexpr std::size_t kShownBytes = 100;

// The entries of one table, from all groups.
std::vector<std::string> entriesOf(const plist::Dictionary& whitelist, std::string_view table) {
  std::vector<std::string> entries;
  for (const plist::Entry& group : whitelist) {
    for (const plist::Entry& entry : group.value.dictionary().dictionary(table)) {
      if (entry.value.dictionary()) entries.emplace_back(entry.key.view());
    }
  }
  return entries;
}

std::unordered_set<std::string> setOf(const std::vector<std::string>& texts) {
  return {texts.begin(), texts.end()};
}

}  // namespace

bool PermittedKeys::Keys::permit(std::string_view key) const {
  return keys.contains(std::string(key)) || prefixes.longestMatch(key).has_value();
}

Status PermittedKeys::add(const std::string& path) {
  const auto bytes = readSourceFile(path, tavrel::limits::kWhitelistBytes, true);
  if (!bytes) return Error{format("whitelist %s: %s", path, bytes.error().message)};
  const auto document = plist::read(asBytes(*bytes));
  if (!document) return Error{format("whitelist %s: %s", path, document.error().message)};
  const plist::Dictionary whitelist = document->dictionary();
  if (!whitelist) return Error{format("whitelist %s: is not a dictionary", path)};
  std::string digest;
  appendHex(digest, LinuxDigest().md5(asBytes(*bytes)));
  whitelists_.insert_or_assign(
      digest, Whitelist{{setOf(entriesOf(whitelist, kScalarKeysTable)),
                         PrefixTree(entriesOf(whitelist, kScalarPrefixesTable))},
                        {setOf(entriesOf(whitelist, kDistributionKeysTable)),
                         PrefixTree(entriesOf(whitelist, kDistributionPrefixesTable))}});
  return Done{};
}

std::string PermittedKeys::faultOf(const LogRecord& record) const {
  const auto whitelist = whitelists_.find(record.whitelistDigest);
  if (whitelist == whitelists_.end()) {
    return format("its whitelist \"%s\" is not among those given",
                  record.whitelistDigest.substr(0, kShownBytes));
  }
  const auto fault = [](std::string_view section, std::string_view key) {
    return format("%s/%s: its whitelist does not permit the key", section,
                  key.substr(0, kShownBytes));
  };
  for (const ScalarRow& row : record.scalars) {
    if (!whitelist->second.scalars.permit(row.key)) return fault(kScalarsMember, row.key);
  }
  for (const DistributionRow& row : record.distributions) {
    if (!whitelist->second.distributions.permit(row.key))
      return fault(kDistributionsMember, row.key);
  }
  return {};
}

}  // namespace tavrel::fleet
