// Where the values of a distribution are: runs of consecutive rows in the table `chunks`.
//
// A run has its values in so many rows and then, in as many, the offsets of the same values, so
// that whoever wants the values alone reads no more. A run of version 1 of the schema has rows of
// records instead, which hold both.
//
// A distribution's row holds its runs in the order of recording. A run is three numbers, each as
// seven bits a byte from the lowest on, the top bit set in all bytes but the last: its first chunk,
// twice the count of its chunks (plus one when they hold records), and the count of its values.
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
  std::int64_t chunks = 0;  // of values or records, without those of offsets
  std::int64_t values = 0;
  bool holdsRecords = false;
  bool operator==(const ChunkRun&) const = default;

  std::int64_t end() const { return first + (holdsRecords ? chunks : 2 * chunks); }
};

/// The most values of a chunk.
inline constexpr std::int64_t kValuesPerChunk = 1024;

/// The most values that a distribution holds in a day.
inline constexpr std::int64_t kValuesPerDistribution = std::int64_t{1} << 30;

void appendRun(std::string& packed, const ChunkRun& run);

/// Nothing when the bytes are no runs, or when one refers to chunks that cannot exist or to more or
/// fewer than its values can take.
std::optional<std::vector<ChunkRun>> unpackRuns(std::string_view packed);

/// The values of all runs; nothing when there are more than a distribution may hold.
std::optional<std::int64_t> valuesIn(std::span<const ChunkRun> runs);

/// The place of the first run that should be joined with all after it, so that many small commits
/// do not leave a distribution in pieces; `runs.size()` when none should. Only runs of less than
/// 1,024 values are joined, 64 at most, and while commits are of one size each value twice.
std::size_t firstToJoin(std::span<const ChunkRun> runs);

/// In version 1 of the schema a distribution had a series: chunks numbered from `series * 1048576`
/// upward, with 1024 values in each but the last. Nothing when no such series can exist.
std::optional<ChunkRun> runOfSeries(std::int64_t series, std::int64_t values);

}  // namespace tavrel
