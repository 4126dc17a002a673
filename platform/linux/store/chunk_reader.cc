#include "platform/linux/store/chunk_reader.h"

#include <utility>

#include "platform/linux/store/sqlite_schema.h"

namespace tavrel {
namespace {

// A record is a value followed by its offset.
constexpr std::size_t kRecordBytes = kPackedValueBytes + kPackedOffsetBytes;

[[noreturn]] void refuse(const std::string& reason) {
  throw StoreFailure{StoreFault::Other, reason + ": restore the file from a copy or move it away"};
}

// The number of items in a chunk.
std::size_t countIn(std::string_view data, std::size_t itemBytes) {
  const std::size_t count = data.size() / itemBytes;
  if (count == 0 || count > kValuesPerChunk || data.size() != count * itemBytes) {
    refuse("its values are not in the form that this program writes");
  }
  return count;
}

}  // namespace

std::optional<std::string_view> ChunkReader::Cursor::at(std::int64_t chunk, std::int64_t last) {
  if (next_ != chunk) {
    end();
    if (!rows_) rows_.emplace(connection_, store_sql::kChunks);
    rows_->bind(1, chunk);
    rows_->bind(2, last + 1);
  }
  next_ = chunk + 1;
  if (!rows_->step() || rows_->integer(0) != chunk) return std::nullopt;
  return rows_->bytes(1);
}

void ChunkReader::Cursor::end() {
  if (next_) rows_->reset();
  next_.reset();
}

void ChunkReader::refuseCount() const {
  refuse("it does not hold the " + std::to_string(count_) + " values that it counts");
}

void ChunkReader::begin(std::vector<ChunkRun> runs, std::int64_t count) {
  end();
  runs_ = std::move(runs);
  run_ = 0;
  chunk_ = 0;
  count_ = count;
  read_ = 0;
  if (count <= 0 || valuesIn(runs_) != count) refuseCount();
}

void ChunkReader::end() {
  values_.end();
  offsets_.end();
}

std::optional<DistributionBlock> ChunkReader::next(bool wantsOffsets) {
  while (run_ < runs_.size() && chunk_ == runs_[run_].chunks) {
    end();
    ++run_;
    chunk_ = 0;
  }
  if (run_ == runs_.size()) {
    if (read_ != count_) refuseCount();
    return std::nullopt;
  }
  const ChunkRun& run = runs_[run_];
  const std::int64_t chunk = run.first + chunk_++;
  const auto data = values_.at(chunk, run.first + run.chunks - 1);
  if (!data) refuseCount();
  const std::size_t count = countIn(*data, run.holdsRecords ? kRecordBytes : kPackedValueBytes);
  read_ += static_cast<std::int64_t>(count);
  if (read_ > count_) refuseCount();
  if (run.holdsRecords) return unpack(*data);
  if (!wantsOffsets) return DistributionBlock{*data, {}};
  const auto offsets = offsets_.at(chunk + run.chunks, run.end() - 1);
  if (!offsets || countIn(*offsets, kPackedOffsetBytes) != count) refuseCount();
  return DistributionBlock{*data, *offsets};
}

DistributionBlock ChunkReader::unpack(std::string_view records) {
  unpackedValues_.clear();
  unpackedOffsets_.clear();
  for (; !records.empty(); records.remove_prefix(kRecordBytes)) {
    unpackedValues_ += records.substr(0, kPackedValueBytes);
    unpackedOffsets_ += records.substr(kPackedValueBytes, kPackedOffsetBytes);
  }
  return {unpackedValues_, unpackedOffsets_};
}

}  // namespace tavrel
