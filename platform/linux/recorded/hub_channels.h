// The channels that a recorded hub knows, with their elements for each update.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string_view>
#include <unordered_map>

#include "base/bytes.h"
#include "base/keyed_hash.h"
#include "base/plist.h"
#include "platform/linux/system_log/refusal_log.h"

namespace tavrel {

/// One channel's elements: a group for the first update, one for the second, and so on.
class HubChannel {
 public:
  explicit HubChannel(plist::Value elements);

  /// The group that update number `update` shows, from 0; empty where the channel was absent. Later
  /// updates repeat the last one.
  ByteSpan group(std::size_t update) const;
  std::size_t largestGroup() const { return largest_; }

 private:
  plist::Value elements_;  // data, or an array of data
  std::size_t largest_ = 0;
};

class HubChannels {
 public:
  /// Adds the "Channels" of a recording. A channel that is already known, or whose elements do not
  /// form whole groups of its own, is left out with a log line.
  void add(const plist::Array& channels, std::string_view origin, RefusalLog& refusals);

  /// Null when the hub does not know the channel.
  const HubChannel* find(std::uint64_t driverID, std::uint64_t channelID) const;

 private:
  struct Key {
    std::uint64_t driverID;
    std::uint64_t channelID;
    bool operator==(const Key&) const = default;
  };
  struct KeyHash {
    // Keyed, because the author of a recording chooses the IDs.
    std::size_t operator()(const Key& key) const {
      return static_cast<std::size_t>(keyedHash(asText(std::as_bytes(std::span(&key, 1)))));
    }
  };

  /// What is wrong with an entry; null when it was taken.
  const char* addOne(const plist::Dictionary& channel);

  std::unordered_map<Key, HubChannel, KeyHash> channels_;
};

}  // namespace tavrel
