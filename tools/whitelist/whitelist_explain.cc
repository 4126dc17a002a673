#include "tools/whitelist/whitelist_explain.h"

#include <nlohmann/json.hpp>
#include <ostream>

#include "base/format.h"
#include "base/limits.h"
#include "base/text.h"
#include "config/bh_config.h"
#include "config/internal_device.h"
#include "report/histogram.h"
#include "report/rounding.h"
#include "tools/console/json_value.h"
#include "tools/console/table.h"
#include "tools/console/typed_value.h"
#include "tools/overlay/overlay_platform.h"
#include "tools/whitelist/whitelist_coarseness.h"
#include "tools/whitelist/whitelist_model.h"
#include "tools/whitelist/whitelist_rules.h"

namespace tavrel {
namespace {

using Rule = KindExplanation::Rule;

constexpr std::string_view kLabels[] = {"  scalar        ", "  distribution  "};
constexpr std::string_view kContinuation = "                ";

std::string_view textOf(BHConfig::Exclusion exclusion) {
  return exclusion == BHConfig::Exclusion::InternalOnly ? "it is for internal devices"
                                                        : "it is switched off by tasking";
}

KindExplanation explainKind(const WhitelistRule* rule, const WhitelistRule* ifAllLoaded,
                            const plist::Dictionary& options, const BHConfig& config,
                            bool isInternalDevice) {
  KindExplanation explanation;
  explanation.options = options;
  if (rule != nullptr) {
    explanation.rule = isPrefixTable(rule->table) ? Rule::Prefix : Rule::Exact;
    explanation.group = rule->group;
    if (explanation.rule == Rule::Prefix) explanation.prefix = rule->key;
  } else if (isInternalDevice) {
    explanation.rule = Rule::Internal;
  }
  if (ifAllLoaded != nullptr && (rule == nullptr || ifAllLoaded->group != rule->group)) {
    if (const auto exclusion = config.exclusionOf(ifAllLoaded->group)) {
      explanation.idleGroup = ifAllLoaded->group;
      explanation.idleReason = textOf(*exclusion);
    }
  }
  return explanation;
}

std::optional<std::string> bucketLabel(double value, const plist::Dictionary& options) {
  const plist::Array intervals = options.array(kIntervalsOption);
  if (!intervals || intervals.size() > limits::kHistogramBoundaries) return std::nullopt;
  std::vector<std::uint32_t> counts(intervals.size() + 1, 0);
  counts[determineHistBucketForValue(value, intervals)] = 1;
  const auto histogram = histogramDictForIntervals(intervals, counts);
  return std::string((*histogram.begin()).key.view());
}

std::string_view ruleName(Rule rule) {
  switch (rule) {
    case Rule::Exact:
      return "exact";
    case Rule::Prefix:
      return "prefix";
    case Rule::Internal:
      return "internal";
    case Rule::None:
      break;
  }
  return "none";
}

std::string ruleText(const KindExplanation& kind) {
  switch (kind.rule) {
    case Rule::Exact:
      return format("group %s, exact key", kind.group);
    case Rule::Prefix:
      return format("group %s, prefix %s", kind.group, kind.prefix.empty() ? "\"\"" : kind.prefix);
    case Rule::Internal:
      return "no rule, but this is an internal device";
    case Rule::None:
      break;
  }
  return "not reported";
}

void printKind(std::ostream& out, const KindExplanation& kind, bool isScalar,
               const std::string& effect) {
  out << kLabels[isScalar ? 0 : 1] << printable(ruleText(kind)) << '\n';
  if (kind.options) out << kContinuation << printable(optionsText(kind.options, isScalar)) << '\n';
  if (!effect.empty()) out << kContinuation << printable(effect) << '\n';
  if (!kind.idleGroup.empty()) {
    out << kContinuation
        << printable(format("group %s would apply, but %s", kind.idleGroup, kind.idleReason))
        << '\n';
  }
}

Json jsonOfKind(const KindExplanation& kind) {
  Json object = {{"reported", static_cast<bool>(kind.options)}, {"rule", ruleName(kind.rule)}};
  if (!kind.group.empty()) object["group"] = kind.group;
  if (kind.rule == Rule::Prefix) object["prefix"] = kind.prefix;
  if (kind.options) object["options"] = jsonOf(plist::Value(kind.options));
  if (!kind.idleGroup.empty()) {
    object["not_loaded"] = {{"group", kind.idleGroup}, {"reason", kind.idleReason}};
  }
  return object;
}

}  // namespace

Expected<ExampleValue> parseExampleValue(std::string_view text) {
  ExampleValue example;
  const auto real = parseArgument(text, ArgumentKind::Real);
  if (!real) return real.error();
  example.real = real->number()->real();
  const auto integer = parseArgument(text, ArgumentKind::Integer);
  const bool fits = integer && integer->number()->kind() == plist::NumberKind::Int64;
  if (fits) example.scalar = integer->number()->int64();
  return example;
}

Expected<std::vector<KeyExplanation>> explainKeys(LinuxPlatform& device, const std::string& bytes,
                                                  const plist::Value& whitelist,
                                                  const std::vector<std::string>& keys,
                                                  const std::optional<ExampleValue>& example) {
  OverlayPlatform overlay(device);
  Platform& platform = overlay.platform();
  overlay.replaceFile(std::string(kWhitelistPath), bytes);
  const auto config = BHConfig::init(platform);
  if (!config) return Error{std::string(overlay.lastError())};

  const WhitelistModel model(whitelist);
  const bool isInternal = BHIsInternalDevice(platform);
  const auto isLoaded = [&](std::string_view group) { return !config->exclusionOf(group); };
  const auto isAny = [](std::string_view) { return true; };
  const WhitelistRules loadedScalars(model, false, isLoaded);
  const WhitelistRules allScalars(model, false, isAny);
  const WhitelistRules loadedDistributions(model, true, isLoaded);
  const WhitelistRules allDistributions(model, true, isAny);

  std::vector<KeyExplanation> explanations;
  for (const std::string& key : keys) {
    KeyExplanation explanation;
    explanation.key = key;
    explanation.scalar = explainKind(loadedScalars.ofKey(key), allScalars.ofKey(key),
                                     config->configOptionsForScalarKey(key), *config, isInternal);
    explanation.distribution =
        explainKind(loadedDistributions.ofKey(key), allDistributions.ofKey(key),
                    config->configOptionsForDistributionKey(key), *config, isInternal);
    explanation.example = example;
    if (example && example->scalar && explanation.scalar.options) {
      explanation.coarsenedScalar = coarsened(*example->scalar, explanation.scalar.options);
    }
    if (example && explanation.distribution.options) {
      explanation.bucket = bucketLabel(example->real, explanation.distribution.options);
    }
    explanations.push_back(std::move(explanation));
  }
  return explanations;
}

void printExplanation(std::ostream& out, const KeyExplanation& explanation) {
  out << printable(explanation.key) << '\n';
  std::string scalarEffect;
  std::string distributionEffect;
  if (explanation.coarsenedScalar) {
    scalarEffect = format("%lld is reported as %lld", *explanation.example->scalar,
                          *explanation.coarsenedScalar);
  } else if (explanation.example && explanation.scalar.options) {
    scalarEffect = "the value is not a 64-bit integer, so it cannot be a scalar";
  }
  if (explanation.bucket) {
    distributionEffect =
        format("%s is counted in %s", numberText(explanation.example->real), *explanation.bucket);
  }
  printKind(out, explanation.scalar, true, scalarEffect);
  printKind(out, explanation.distribution, false, distributionEffect);
}

Json jsonOf(const std::vector<KeyExplanation>& explanations) {
  Json list = Json::array();
  for (const KeyExplanation& explanation : explanations) {
    Json scalar = jsonOfKind(explanation.scalar);
    if (explanation.coarsenedScalar) {
      scalar["value"] = *explanation.example->scalar;
      scalar["reported_value"] = *explanation.coarsenedScalar;
    }
    Json distribution = jsonOfKind(explanation.distribution);
    if (explanation.bucket) {
      distribution["value"] = jsonOf(explanation.example->real);
      distribution["bucket"] = *explanation.bucket;
    }
    list.push_back({{"key", explanation.key},
                    {"scalar", std::move(scalar)},
                    {"distribution", std::move(distribution)}});
  }
  return list;
}

}  // namespace tavrel
