// Values of distributions that wait to be written, so that each row is written once.
//
//   PendingDistributions pending;
//   pending.append(pending.series(day, key), value, secondsInDay);
//   pending.each(take);  // take(day, key, block) for each row
//   pending.clear();
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
#include "platform/linux/store/sample_memory.h"

namespace tavrel {

class PendingDistributions {
  // Consecutive values of one distribution, followed in memory by their offsets.
  struct Piece {
    std::byte* values;
    std::uint32_t capacity;
  };

 public:
  /// The values of one distribution.
  class Series {
    friend class PendingDistributions;
    // Where the next value goes in the last piece, and how many more fit.
    std::byte* value_ = nullptr;
    std::byte* offset_ = nullptr;
    std::uint32_t room_ = 0;
    std::vector<Piece> pieces_;
    std::unique_ptr<const std::string> key_;
  };

  /// Stays in place until `clear`.
  Series& series(std::int32_t day, std::string_view key);
  void append(Series& series, double value, std::uint32_t secondsInDayOffset) {
    if (series.room_ == 0) grow(series);
    storeLittle64({series.value_, kPackedValueBytes}, 0, std::bit_cast<std::uint64_t>(value));
    storeLittle32({series.offset_, kPackedOffsetBytes}, 0, secondsInDayOffset);
    series.value_ += kPackedValueBytes;
    series.offset_ += kPackedOffsetBytes;
    --series.room_;
  }
  void append(std::int32_t day, std::string_view key, std::span<const DistributionSample> samples);

  /// Passes all values on, by day and then by key, those of each row in the order of `append`. The
  /// blocks are valid during the call.
  template <class Take>
  void each(Take take) const {
    std::string values;
    std::string offsets;
    for (const Entry* entry : sorted()) {
      gather(entry->second, values, offsets);
      if (!values.empty()) {
        take(entry->first.day, entry->first.key, DistributionBlock{values, offsets});
      }
    }
  }
  /// Keeps the memory for later values.
  void clear();

  bool empty() const { return series_.empty(); }
  /// Memory in use.
  std::size_t bytes() const { return bytes_; }

 private:
  struct Name {
    std::int32_t day = 0;
    std::string_view key;  // owned by the series
    bool operator==(const Name&) const = default;
  };
  struct HashName {
    std::size_t operator()(const Name& name) const;
  };
  using Map = std::unordered_map<Name, Series, HashName>;
  using Entry = Map::value_type;

  void grow(Series& series);
  std::vector<const Entry*> sorted() const;
  static void gather(const Series& series, std::string& values, std::string& offsets);

  Map series_;
  Entry* last_ = nullptr;  // used last; successive values often share a distribution
  SampleMemory memory_;
  std::size_t bytes_ = 0;
};

}  // namespace tavrel
