// The whitelist: which statistics keys may leave the device, and how each is coarsened.
//
// The file is a property list: a dictionary of groups, each with up to four tables from keys, or
// key prefixes, to options. docs/whitelist.md describes it.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "base/plist.h"
#include "config/prefix_tree.h"
#include "platform/platform.h"

namespace tavrel {

inline constexpr std::string_view kWhitelistPath =
    "/Library/Application Support/Brimhold/Whitelist_Pellio.plist";

/// The group that only internal devices load.
inline constexpr std::string_view kInternalTestingGroup = "InternalTesting";

/// Names of a group's tables. Other entries of a group are ignored.
inline constexpr std::string_view kScalarKeysTable = "ScalarKeys";
inline constexpr std::string_view kScalarPrefixesTable = "ScalarKeyPrefixes";
inline constexpr std::string_view kDistributionKeysTable = "DistributionKeys";
inline constexpr std::string_view kDistributionPrefixesTable = "DistributionKeyPrefixes";

/// Per-key options.
inline constexpr std::string_view kSignificantFiguresOption = "sig_fig";
inline constexpr std::string_view kBucketIntervalOption = "bucket_interval";
inline constexpr std::string_view kIntervalsOption = "intervals";

/// Immutable once made. The platform must outlive it.
class BHConfig {
 public:
  /// Reads the whitelist. Null when it cannot be read or parsed; the system log has the reason.
  /// When groups list the same key, the later one in the file decides. Values of the wrong type are
  /// skipped.
  static std::unique_ptr<BHConfig> init(Platform& platform);

  /// The options of a key; an empty handle when it may not be reported. An exact entry takes
  /// precedence over the longest prefix. Internal devices report every other key unchanged.
  plist::Dictionary configOptionsForScalarKey(std::string_view key) const;
  plist::Dictionary configOptionsForDistributionKey(std::string_view key) const;

  /// Why the daemon does not load a group of this name.
  enum class Exclusion : std::uint8_t { InternalOnly, SwitchedOff };

  /// Nothing for a group that is loaded.
  std::optional<Exclusion> exclusionOf(std::string_view group) const;

  /// MD5 of the whitelist file's bytes in 32 lower-case hexadecimal digits.
  const std::string& configFileDigest() const { return _configFileDigest; }

 private:
  explicit BHConfig(Platform& platform);

  bool load();
  void loadGroup(const plist::Dictionary& group);
  plist::Dictionary optionsFor(std::string_view key, const plist::Dictionary& keys,
                               const plist::Dictionary& prefixes, const PrefixTree& tree) const;

  Platform& platform_;
  plist::Dictionary _scalarKeys = plist::Dictionary::create();
  plist::Dictionary _scalarPrefixes = plist::Dictionary::create();
  plist::Dictionary _distributionKeys = plist::Dictionary::create();
  plist::Dictionary _distributionPrefixes = plist::Dictionary::create();
  bool _isInternalDevice;
  std::string _configFileDigest;

  PrefixTree scalarPrefixTree_;
  PrefixTree distributionPrefixTree_;
};

}  // namespace tavrel
