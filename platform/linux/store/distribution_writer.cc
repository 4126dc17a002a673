#include "platform/linux/store/distribution_writer.h"

#include <algorithm>
#include <limits>
#include <utility>
#include <vector>

#include "platform/linux/store/chunk_reader.h"

namespace tavrel {
namespace {

[[noreturn]] void throwInconsistent() {
  throw RowFailure{StoreFault::Other,
                   "the values of a distribution do not match their count: restore the file from "
                   "a copy or move it away"};
}

}  // namespace

DistributionWriter::DistributionWriter(SqliteConnection& connection)
    : connection_(connection),
      getRuns_(connection, "SELECT count, runs FROM distributions WHERE day = ?1 AND key = ?2"),
      setRuns_(connection,
               "INSERT OR REPLACE INTO distributions (day, key, count, runs) "
               "VALUES (?1, ?2, ?3, ?4)"),
      addChunk_(connection, "INSERT INTO chunks (chunk, data) VALUES (?1, ?2)") {}

void DistributionWriter::append(std::int32_t day, std::string_view key,
                                const DistributionBlock& added) {
  getRuns_.bind(1, day);
  getRuns_.bind(2, key);
  std::vector<ChunkRun> runs;
  std::int64_t count = 0;
  if (getRuns_.step()) {
    count = getRuns_.integer(0);
    auto unpacked = unpackRuns(getRuns_.bytes(1));
    getRuns_.reset();
    if (!unpacked || count <= 0 || valuesIn(*unpacked) != count) throwInconsistent();
    runs = std::move(*unpacked);
  }
  getRuns_.reset();

  const auto addedCount = static_cast<std::int64_t>(added.values.size() / kPackedValueBytes);
  if (addedCount > kValuesPerDistribution - count) {
    throw RowFailure{StoreFault::Other, "a distribution holds " + std::to_string(count) +
                                            " values of one day and takes no more: use another "
                                            "key"};
  }
  runs.push_back({0, 0, addedCount});
  const std::size_t first = std::min(firstToJoin(runs), runs.size() - 1);
  // Damaged values stay where they are, and each reader reports them.
  if (auto earlier = takeOut(std::span(runs).subspan(first, runs.size() - 1 - first))) {
    runs[first] = writeRun({earlier->values += added.values, earlier->offsets += added.offsets});
    runs.resize(first + 1);
  } else {
    runs.back() = writeRun(added);
  }

  std::string packed;
  for (const ChunkRun& run : runs)
    appendRun(packed, run);
  setRuns_.bind(1, day);
  setRuns_.bind(2, key);
  setRuns_.bind(3, count + addedCount);
  setRuns_.bind(4, std::string_view(packed));
  setRuns_.run();
}

// Takes the chunks of the runs out of the store. When they are not as the runs say, returns nothing
// and changes nothing.
std::optional<DistributionWriter::Packed> DistributionWriter::takeOut(
    std::span<const ChunkRun> runs) {
  if (runs.empty()) return std::nullopt;
  Packed found;
  try {
    ChunkReader reader(connection_);
    reader.begin({runs.begin(), runs.end()}, *valuesIn(runs));
    while (const auto block = reader.next(true)) {
      found.values += block->values;
      found.offsets += block->offsets;
    }
  } catch (const StoreFailure& failure) {
    if (failure.fault != StoreFault::Other) throw;
    return std::nullopt;
  }
  SqliteStatement remove(connection_, "DELETE FROM chunks WHERE chunk >= ?1 AND chunk < ?2");
  for (const ChunkRun& run : runs) {
    remove.bind(1, run.first);
    remove.bind(2, run.end());
    remove.run();
  }
  return found;
}

// Writes new chunks after all others.
ChunkRun DistributionWriter::writeRun(const DistributionBlock& block) {
  if (nextChunk_ < 0) {
    nextChunk_ = connection_.integer("SELECT ifnull(max(chunk) + 1, 0) FROM chunks");
  }
  const auto count = static_cast<std::int64_t>(block.values.size() / kPackedValueBytes);
  const ChunkRun run{nextChunk_, (count + kValuesPerChunk - 1) / kValuesPerChunk, count};
  addChunks(block.values, kValuesPerChunk * kPackedValueBytes);
  addChunks(block.offsets, kValuesPerChunk * kPackedOffsetBytes);
  return run;
}

void DistributionWriter::addChunks(std::string_view data, std::size_t bytesPerChunk) {
  for (; !data.empty(); data.remove_prefix(std::min(bytesPerChunk, data.size()))) {
    if (nextChunk_ < 0 || nextChunk_ == std::numeric_limits<std::int64_t>::max()) {
      throw StoreFailure{StoreFault::Other,
                         "no number is left for more values: move the file away"};
    }
    addChunk_.bind(1, nextChunk_++);
    addChunk_.bind(2, data.substr(0, bytesPerChunk));
    addChunk_.run();
  }
}

}  // namespace tavrel
