#include "platform/linux/store/chunk_runs.h"

#include <algorithm>
#include <limits>

namespace tavrel {
namespace {

// The fewest chunks that can hold so many values.
std::int64_t chunksFor(std::int64_t values) {
  return values / kValuesPerChunk + (values % kValuesPerChunk != 0 ? 1 : 0);
}

void appendNumber(std::string& packed, std::int64_t number) {
  auto rest = static_cast<std::uint64_t>(number);
  for (; rest >= 0x80; rest >>= 7)
    packed += static_cast<char>(rest | 0x80);
  packed += static_cast<char>(rest);
}

// Takes a number from the front; nothing when there is no valid, non-negative one.
std::optional<std::int64_t> takeNumber(std::string_view& packed) {
  constexpr int kLastShift = 56;  // nine bytes hold 63 bits
  std::uint64_t number = 0;
  for (int shift = 0; shift <= kLastShift && !packed.empty(); shift += 7) {
    const auto byte = static_cast<unsigned char>(packed.front());
    packed.remove_prefix(1);
    number |= std::uint64_t{byte & 0x7FU} << shift;
    if (byte < 0x80) return static_cast<std::int64_t>(number);
  }
  return std::nullopt;
}

// A chunk holds at least one value, and at most `kValuesPerChunk`. The removal of a run relies on
// this: a run with too many chunks would remove those of other runs.
bool holds(std::int64_t chunks, std::int64_t values) {
  return chunks >= chunksFor(values) && chunks <= values;
}

}  // namespace

void appendRun(std::string& packed, const ChunkRun& run) {
  appendNumber(packed, run.first);
  appendNumber(packed, run.chunks * 2 + (run.holdsRecords ? 1 : 0));
  appendNumber(packed, run.values);
}

std::optional<std::vector<ChunkRun>> unpackRuns(std::string_view packed) {
  std::vector<ChunkRun> runs;
  while (!packed.empty()) {
    const auto first = takeNumber(packed);
    const auto chunks = takeNumber(packed);
    const auto values = takeNumber(packed);
    if (!first || !chunks || !values ||
        *chunks > std::numeric_limits<std::int64_t>::max() - *first ||
        !holds(*chunks / 2, *values)) {
      return std::nullopt;
    }
    runs.push_back({*first, *chunks / 2, *values, *chunks % 2 != 0});
  }
  return runs;
}

std::optional<std::int64_t> valuesIn(std::span<const ChunkRun> runs) {
  std::int64_t sum = 0;
  for (const ChunkRun& run : runs) {
    if (run.values > kValuesPerDistribution - sum) return std::nullopt;
    sum += run.values;
  }
  return sum;
}

std::size_t firstToJoin(std::span<const ChunkRun> runs) {
  struct Rule {
    std::int64_t below;  // counts runs of fewer values, from the end
    std::ptrdiff_t count;
  };
  // The limit of the second rule leaves room for the runs that the first leaves alone.
  constexpr Rule kRules[] = {{32, 32}, {kValuesPerChunk, 64}};
  std::size_t first = runs.size();
  for (const Rule& rule : kRules) {
    const auto end = std::find_if(runs.rbegin(), runs.rend(), [&rule](const ChunkRun& run) {
      return run.values >= rule.below;
    });
    if (end - runs.rbegin() >= rule.count) first = static_cast<std::size_t>(runs.rend() - end);
  }
  return first;
}

std::optional<ChunkRun> runOfSeries(std::int64_t series, std::int64_t values) {
  constexpr int kOrdinalBits = 20;
  constexpr std::int64_t kSeriesEnd = std::int64_t{1} << (62 - kOrdinalBits);
  if (series < 0 || series >= kSeriesEnd) return std::nullopt;
  return ChunkRun{series << kOrdinalBits, chunksFor(values), values, true};
}

}  // namespace tavrel
