#include "config/bh_config.h"

#include <utility>
#include <vector>

#include "base/limits.h"
#include "base/text.h"
#include "config/internal_device.h"
#include "platform/persisted_state.h"

namespace tavrel {
namespace {

void copyTable(const plist::Dictionary& from, plist::Dictionary& to) {
  for (const plist::Entry& entry : from) {
    if (entry.value.dictionary()) to.set(entry.key, entry.value);
  }
}

PrefixTree treeOf(const plist::Dictionary& prefixes) {
  std::vector<std::string> texts;
  texts.reserve(prefixes.size());
  for (const plist::Entry& entry : prefixes)
    texts.emplace_back(entry.key.view());
  return PrefixTree(std::move(texts));
}

}  // namespace

BHConfig::BHConfig(Platform& platform)
    : platform_(platform), _isInternalDevice(BHIsInternalDevice(platform)) {}

std::unique_ptr<BHConfig> BHConfig::init(Platform& platform) {
  std::unique_ptr<BHConfig> config(new BHConfig(platform));
  if (!config->load()) return nullptr;
  return config;
}

bool BHConfig::load() {
  const auto bytes = platform_.files->read(kWhitelistPath, limits::kWhitelistBytes);
  if (!bytes) {
    platform_.log->log(LogLevel::Error, "Couldn't load whitelist");
    platform_.log->write(LogLevel::Error, bytes.error().message);
    return false;
  }
  appendHex(_configFileDigest, platform_.digest->md5(asBytes(*bytes)));

  const auto whitelist = platform_.propertyLists->decode(asBytes(*bytes));
  if (!whitelist) {
    platform_.log->log(LogLevel::Error, "Couldn't parse the contents of the config file. Error: %@",
                       whitelist.error().message);
    return false;
  }
  for (const plist::Entry& group : whitelist->dictionary()) {
    const auto exclusion = exclusionOf(group.key);
    if (!exclusion) {
      loadGroup(group.value.dictionary());
    } else if (exclusion == Exclusion::SwitchedOff) {
      platform_.log->log(LogLevel::Default, "keyGroup %@ is disabled by tasking", group.key);
    }
  }
  scalarPrefixTree_ = treeOf(_scalarPrefixes);
  distributionPrefixTree_ = treeOf(_distributionPrefixes);
  return true;
}

std::optional<BHConfig::Exclusion> BHConfig::exclusionOf(std::string_view group) const {
  if (!_isInternalDevice && group == kInternalTestingGroup) return Exclusion::InternalOnly;
  bool exists = false;
  const bool enabled =
      platform_.preferences->ZTXPreferencesGetBoolValue(group, kTaskingDomain, &exists);
  if (exists && !enabled && !_isInternalDevice) return Exclusion::SwitchedOff;
  return std::nullopt;
}

void BHConfig::loadGroup(const plist::Dictionary& group) {
  copyTable(group.dictionary(kScalarKeysTable), _scalarKeys);
  copyTable(group.dictionary(kScalarPrefixesTable), _scalarPrefixes);
  copyTable(group.dictionary(kDistributionKeysTable), _distributionKeys);
  copyTable(group.dictionary(kDistributionPrefixesTable), _distributionPrefixes);
}

plist::Dictionary BHConfig::configOptionsForScalarKey(std::string_view key) const {
  return optionsFor(key, _scalarKeys, _scalarPrefixes, scalarPrefixTree_);
}

plist::Dictionary BHConfig::configOptionsForDistributionKey(std::string_view key) const {
  return optionsFor(key, _distributionKeys, _distributionPrefixes, distributionPrefixTree_);
}

plist::Dictionary BHConfig::optionsFor(std::string_view key, const plist::Dictionary& keys,
                                       const plist::Dictionary& prefixes,
                                       const PrefixTree& tree) const {
  if (auto exact = keys.dictionary(key)) return exact;
  if (const auto prefix = tree.longestMatch(key)) {
    platform_.log->log(LogLevel::Debug, "prefix match %@ for %@", *prefix, key);
    return prefixes.dictionary(*prefix);
  }
  if (_isInternalDevice) {
    platform_.log->log(LogLevel::Debug, "passing @{} for %@ as device is Norvane Internal", key);
    return plist::Dictionary::create();
  }
  return {};
}

}  // namespace tavrel
