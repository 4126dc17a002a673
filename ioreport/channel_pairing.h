// Pairs the channels of one array with those of another.
//
// A channel is first compared with the one at its own index. If they differ, a search goes forward
// through the others: from the position after the last match of a search or, before any match,
// after the channel's own index. Earlier positions are never searched again, so channels pair in
// order. The first search sorts the others by identity, so that many searches stay cheap.
#pragma once

#include <compare>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <vector>

#include "base/plist.h"

namespace tavrel {

class ChannelPairing {
 public:
  explicit ChannelPairing(const plist::Array& others) : others_(others) {}

  /// Sets the match of the channel at `index`, an empty handle when it has none. False when a type
  /// cannot be read. Call with ascending indexes.
  bool find(std::size_t index, const plist::Dictionary& channel, plist::Dictionary& match);

 private:
  struct Identity {
    std::int64_t driverID;
    std::int64_t channelID;
    std::uint64_t type;
    auto operator<=>(const Identity&) const = default;
  };
  struct Position {
    Identity identity;
    std::size_t index;
    auto operator<=>(const Position&) const = default;
  };

  static std::optional<Identity> identityOf(const plist::Dictionary& channel);
  void sortOthers();

  plist::Array others_;
  std::optional<std::vector<Position>> sorted_;
  std::optional<std::size_t> searchStart_;
};

}  // namespace tavrel
