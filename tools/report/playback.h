// Samples in the form in which the hub of a recording plays them back.
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <utility>
#include <vector>

#include "base/plist.h"

namespace tavrel {

class Playback {
 public:
  /// `bytes` are those that a document in XML has for it.
  explicit Playback(std::size_t bytes) : bytes_(bytes) {}

  /// Adds the channels of a sample. Does nothing, and returns false, when the document has no room.
  bool add(const std::vector<plist::Dictionary>& sample);

  std::size_t samples() const { return samples_; }

  /// The hub's channels. Empty data stands for samples in which a channel was absent.
  plist::Array channels();

 private:
  using Key = std::pair<std::int64_t, std::int64_t>;  // driver and channel

  static Key keyOf(const plist::Dictionary& channel);
  void pad(plist::Array& groups) const;

  const std::size_t bytes_;
  std::size_t sampleBytes_ = 0;  // of a sample in which no channel is absent
  std::size_t samples_ = 0;
  std::map<Key, plist::Array> groups_;
};

}  // namespace tavrel
