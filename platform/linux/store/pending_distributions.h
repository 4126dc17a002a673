// Values of distributions that wait to be written, so that each row is written once.
//
//   PendingDistributions pending;
//   pending.append(day, key, samples);
//   pending.each([&](std::int32_t day, std::string_view key, const DistributionBlock& block) { ...
//   }); pending.clear();
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "platform/distribution_values.h"

namespace tavrel {

class PendingDistributions {
 public:
  /// What a waiting value takes of memory. A distribution takes some more.
  static constexpr std::size_t kSampleBytes = kPackedValueBytes + kPackedOffsetBytes;

  void append(std::int32_t day, std::string_view key, std::span<const DistributionSample> samples);

  /// Passes all on, by day and then by key, the values of each in the order of `append`. The blocks
  /// are valid during the call.
  template <class Take>
  void each(Take take) const {
    std::string values;
    std::string offsets;
    for (const Entry* entry : sorted()) {
      gather(entry->second, values, offsets);
      take(entry->first.day, entry->first.key, DistributionBlock{values, offsets});
    }
  }
  /// Keeps memory for what comes next.
  void clear();

  bool empty() const { return series_.empty(); }
  /// Of memory.
  std::size_t bytes() const { return bytes_; }

 private:
  // Values in the order of their arrival, of any distribution: what waits is copied once, and no
  // growing buffer leaves pages behind that were touched in vain.
  struct Block {
    static constexpr std::size_t kSamples = 4096;
    std::byte values[kSamples * kPackedValueBytes];
    std::byte offsets[kSamples * kPackedOffsetBytes];
  };
  // Values of one distribution that follow each other in a block.
  struct Piece {
    std::size_t block;
    std::uint32_t first;
    std::uint32_t count;
  };
  struct Name {
    std::int32_t day = 0;
    std::string_view key;  // of the series
    bool operator==(const Name&) const = default;
  };
  struct HashName {
    std::size_t operator()(const Name& name) const;
  };
  struct Series {
    std::unique_ptr<const std::string> key;
    std::vector<Piece> pieces;
  };
  using Map = std::unordered_map<Name, Series, HashName>;
  using Entry = Map::value_type;

  Series& find(const Name& name);
  std::vector<const Entry*> sorted() const;
  void gather(const Series& series, std::string& values, std::string& offsets) const;

  Map series_;
  Entry* last_ = nullptr;  // values of one distribution often follow each other
  std::vector<std::unique_ptr<Block>> blocks_;
  std::size_t samples_ = 0;  // in the blocks
  std::size_t bytes_ = 0;
};

}  // namespace tavrel
