// Records datagrams of StatsD lines through libbrimhold.
#pragma once

#include <array>
#include <brimhold/client.h>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <unordered_map>

#include "base/keyed_hash.h"
#include "statsd/statsd_line.h"

namespace tavrel {

/// Turns a name into a key: letters, digits, ".", "_" and "-" stay; any other byte becomes "_".
void appendStatsdKey(std::string& key, std::string_view name);

/// What the program records about itself, under PREFIX "tavrel-statsd.".
enum class StatsdFault : std::uint8_t {
  Malformed,    // lines
  Unsupported,  // lines
  Refused,      // lines whose key is too long or exceeds the number of keys
  TooLong,      // datagrams
};

class StatsdRecorder {
 public:
  /// `prefix` must be text that `isStatsdPrefix` accepts.
  explicit StatsdRecorder(std::string prefix);

  /// Takes lines that are separated by line ends.
  void take(std::string_view datagram);
  /// Counts something that was not recorded.
  void count(StatsdFault fault) const;
  /// Whether a line was refused because the keys of this process have no room for its own.
  bool isOutOfKeys() const { return isOutOfKeys_; }

 private:
  struct Key {
    BHClientScalarKey* scalar = nullptr;
    BHClientDistributionKey* series = nullptr;
    double remainder = 0;  // of a scalar: the fraction below one; of a series: that of its copies
  };
  using Keys = std::unordered_map<std::string, Key, KeyedHash, std::equal_to<>>;

  void takeLine(std::string_view text);
  bool record(const StatsdLine& line);
  Key* find(Keys& keys, std::string_view name);

  std::string prefix_;
  std::string name_;  // the key being looked up
  StatsdLine line_;
  Keys scalars_;
  Keys series_;
  std::size_t keysLeft_;
  std::size_t nameBytesLeft_;
  bool isOutOfKeys_ = false;
  std::array<BHClientScalarKey*, 4> faults_;
};

/// Whether the text may be the prefix of keys: letters, digits, ".", "_" and "-", up to 200 bytes.
bool isStatsdPrefix(std::string_view text);

}  // namespace tavrel
