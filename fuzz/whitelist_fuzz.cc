// A whitelist of any bytes: loading and checking it must end properly, and what the tool explains
// must agree with what the daemon decides.
#include <string>

#include "config/bh_config.h"
#include "platform/linux/linux_platform.h"
#include "platform/plist/coding.h"
#include "plist_mutator.h"
#include "require.h"
#include "tools/overlay/overlay_platform.h"
#include "tools/whitelist/whitelist_check.h"
#include "tools/whitelist/whitelist_model.h"
#include "tools/whitelist/whitelist_rules.h"

using namespace tavrel;
using fuzz::require;

namespace {

constexpr std::size_t kComparedRules = 200;

void compare(const WhitelistRules& rules, const plist::Dictionary& found, std::string_view key) {
  const WhitelistRule* const rule = rules.ofKey(key);
  require((rule != nullptr) == static_cast<bool>(found));
  if (rule == nullptr) return;
  require(isPrefixTable(rule->table) ? key.starts_with(rule->key) : key == rule->key);
  require(plist::Value(rule->options) == plist::Value(found));
}

}  // namespace

extern "C" std::size_t LLVMFuzzerCustomMutator(std::uint8_t* data, std::size_t size,
                                               std::size_t most, unsigned seed) {
  return fuzz::mutatePropertyList(data, size, most, seed);
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static LinuxPlatform device{DeviceRoot("/nonexistent")};
  const std::string bytes(reinterpret_cast<const char*>(data), size);
  OverlayPlatform overlay(device);
  overlay.replaceFile(std::string(kWhitelistPath), bytes);
  const auto config = BHConfig::init(overlay.platform());

  const auto whitelist = plist::read(asBytes(bytes));
  require(static_cast<bool>(whitelist) == (config != nullptr));
  if (!whitelist) return 0;
  checkWhitelist(*whitelist);

  const WhitelistModel model(*whitelist);
  const WhitelistRules scalars(model, false);
  const WhitelistRules distributions(model, true);
  const auto compareBoth = [&](std::string_view key) {
    compare(scalars, config->configOptionsForScalarKey(key), key);
    compare(distributions, config->configOptionsForDistributionKey(key), key);
  };
  for (std::size_t table = 0; table < kWhitelistTables.size(); ++table) {
    std::size_t compared = 0;
    for (const WhitelistRule& rule : model.rules(static_cast<WhitelistTable>(table))) {
      if (++compared > kComparedRules) break;
      compareBoth(rule.key);
      compareBoth(std::string(rule.key) + "x");
      compareBoth(rule.key.substr(0, rule.key.size() / 2));
    }
  }
  return 0;
}
