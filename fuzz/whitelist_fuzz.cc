// A whitelist of any bytes: loading and checking it must end properly, and what the tool explains
// must agree with what the daemon decides.
#include <cstdlib>
#include <string>

#include "config/bh_config.h"
#include "platform/linux/linux_platform.h"
#include "platform/plist/coding.h"
#include "plist_mutator.h"
#include "tools/overlay/overlay_platform.h"
#include "tools/whitelist/whitelist_check.h"
#include "tools/whitelist/whitelist_model.h"

using namespace tavrel;

namespace {

constexpr std::size_t kComparedRules = 200;

void require(bool condition) {
  if (!condition) std::abort();
}

void compare(const BHConfig& config, const WhitelistModel& model,
             const WhitelistDecisions& decisions, std::string_view key) {
  using Table = WhitelistTable;
  const auto compareKind = [&](Table keys, Table prefixes, const plist::Dictionary& found) {
    const auto decision = decisions.decide(keys, prefixes, key);
    require((decision.rule == WhitelistDecision::Rule::None) == !found);
    if (!found) return;
    const bool exact = decision.rule == WhitelistDecision::Rule::Exact;
    const std::string_view name = exact ? key : decision.prefix;
    bool known = false;
    for (const WhitelistRule& rule : model.rules(exact ? keys : prefixes)) {
      known = known || (rule.group == decision.group && rule.key == name &&
                        plist::Value(rule.options) == plist::Value(found));
    }
    require(known);
  };
  compareKind(Table::ScalarKeys, Table::ScalarPrefixes, config.configOptionsForScalarKey(key));
  compareKind(Table::DistributionKeys, Table::DistributionPrefixes,
              config.configOptionsForDistributionKey(key));
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
  const WhitelistDecisions decisions(
      model, false, [](std::string_view group) { return group != kInternalTestingGroup; });
  for (std::size_t table = 0; table < kWhitelistTables.size(); ++table) {
    std::size_t compared = 0;
    for (const WhitelistRule& rule : model.rules(static_cast<WhitelistTable>(table))) {
      if (++compared > kComparedRules) break;
      compare(*config, model, decisions, rule.key);
      compare(*config, model, decisions, std::string(rule.key) + "x");
      compare(*config, model, decisions, rule.key.substr(0, rule.key.size() / 2));
    }
  }
  return 0;
}
