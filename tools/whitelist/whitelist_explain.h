// What the whitelist decides about keys, and why.
#pragma once

#include <cstdint>
#include <iosfwd>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/expected.h"
#include "base/plist.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

/// A value whose coarsening is to be shown: as a scalar when it is a 64-bit integer, and as
/// a value of a distribution.
struct ExampleValue {
  std::optional<std::int64_t> scalar;
  double real = 0;
};

Expected<ExampleValue> parseExampleValue(std::string_view text);

struct KindExplanation {
  enum class Rule : std::uint8_t { None, Exact, Prefix, Internal };
  Rule rule = Rule::None;
  std::string group;
  std::string prefix;
  /// The options that the daemon finds; an empty handle when the key is not reported.
  plist::Dictionary options;
  /// The group whose rule would decide if the group were loaded, and why it is not.
  std::string idleGroup;
  std::string idleReason;
};

struct KeyExplanation {
  std::string key;
  KindExplanation scalar;
  KindExplanation distribution;
  std::optional<ExampleValue> example;
  std::optional<std::int64_t> coarsenedScalar;
  std::optional<std::string> bucket;  // label of the example's histogram bucket
};

/// Queries the daemon's own configuration, made from `bytes`, and looks up the rules in
/// `whitelist`, which must be the value that `bytes` encode.
Expected<std::vector<KeyExplanation>> explainKeys(LinuxPlatform& device, const std::string& bytes,
                                                  const plist::Value& whitelist,
                                                  const std::vector<std::string>& keys,
                                                  const std::optional<ExampleValue>& example);

void printExplanation(std::ostream& out, const KeyExplanation& explanation);
Json jsonOf(const std::vector<KeyExplanation>& explanations);

}  // namespace tavrel
