// Where the values of a distribution are: runs of consecutive rows in the table `chunks`.
//
// A run holds values in a number of rows and then, in as many rows, the offsets of these values, so
// that a reader of the values alone reads nothing else. A run of schema version 1 has rows of
// records instead, which hold both.
//
// A distribution's row holds its runs in the order of recording. A run is three numbers, each in
// bytes of seven bits, lowest bits first, with the top bit set in all bytes but the last: its first
// chunk, twice the count of its chunks (plus one when they hold records), and the count of its
// values.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace tavrel {

struct ChunkRun {
  std::int64_t first = 0;
  std::int64_t chunks = 0;  // of values or records, not counting offsets
  std::int64_t values = 0;
  bool holdsRecords = false;
  bool operator==(const ChunkRun&) const = default;

  std::int64_t end() const { return first + (holdsRecords ? chunks : 2 * chunks); }
};

/// The most values in a chunk.
inline constexpr std::int64_t kValuesPerChunk = 1024;

/// The most values that a distribution holds in a day.
inline constexpr std::int64_t kValuesPerDistribution = std::int64_t{1} << 30;

void appendRun(std::string& packed, const ChunkRun& run);

/// Nothing when the bytes are malformed, or when a run's chunks cannot exist or are too many or too
/// few for its values.
std::optional<std::vector<ChunkRun>> unpackRuns(std::string_view packed);

/// The number of values in all runs; nothing when there are more than a distribution may hold.
std::optional<std::int64_t> valuesIn(std::span<const ChunkRun> runs);

/// The index of the first run to join with all after it, so that many small commits do not leave a
/// distribution in pieces; `runs.size()` for none. Joins only runs of fewer than 1,024 values, at
/// most 64 of them. With commits of equal size, each value is joined twice.
std::size_t firstToJoin(std::span<const ChunkRun> runs);

/// In schema version 1 a distribution had a series: chunks numbered from `series * 1048576` upward,
/// with 1024 values in each but the last. Nothing when no such series can exist.
std::optional<ChunkRun> runOfSeries(std::int64_t series, std::int64_t values);

}  // namespace tavrel
