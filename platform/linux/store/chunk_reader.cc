#include "platform/linux/store/chunk_reader.h"

#include <string_view>
#include <utility>

#include "platform/linux/store/sqlite_schema.h"

namespace tavrel {
namespace {

// The columns of store_sql::chunks.
enum Column : std::uint8_t { kNumber, kOffsetBytes, kData, kOffsets };

[[noreturn]] void refuse(const std::string& reason) {
  throw StoreFailure{StoreFault::Other, reason + ": restore the file from a copy or move it away"};
}

[[noreturn]] void refuseForm() {
  refuse("its values are not in the form that this program writes");
}

}  // namespace

void ChunkReader::refuseCount() const {
  refuse("it does not hold the " + std::to_string(count_) + " values that it counts");
}

void ChunkReader::begin(std::vector<ChunkRun> runs, std::int64_t count) {
  end();
  runs_ = std::move(runs);
  run_ = 0;
  count_ = count;
  read_ = 0;
  if (count <= 0 || valuesIn(runs_) != count) refuseCount();
}

void ChunkReader::end() {
  if (active_) active_->reset();
  active_ = nullptr;
}

// True with a row. The statement changes when offsets are wanted only from some chunk on.
bool ChunkReader::step(bool wantsOffsets) {
  auto& statement = wantsOffsets ? valuesAndOffsets_ : values_;
  if (active_ && active_ != &*statement) end();
  for (; run_ < runs_.size(); ++run_) {
    ChunkRun& run = runs_[run_];
    if (!active_) {
      if (!statement) statement.emplace(connection_, store_sql::chunks(wantsOffsets, version_));
      active_ = &*statement;
      active_->bind(1, run.first);
      active_->bind(2, run.first + run.chunks);
    }
    if (active_->step()) {
      const std::int64_t next = active_->integer(kNumber) + 1;
      run.chunks -= next - run.first;
      run.first = next;
      return true;
    }
    end();
  }
  return false;
}

std::optional<DistributionBlock> ChunkReader::next(bool wantsOffsets) {
  if (!step(wantsOffsets)) {
    if (read_ != count_) refuseCount();
    return std::nullopt;
  }
  const DistributionBlock block = blockAt(wantsOffsets);
  read_ += static_cast<std::int64_t>(block.values.size() / kPackedValueBytes);
  if (read_ > count_) refuseCount();
  return block;
}

DistributionBlock ChunkReader::blockAt(bool wantsOffsets) {
  const std::string_view data = active_->bytes(kData);
  const bool holdsRecords = active_->isNull(kOffsetBytes);
  const std::size_t valueBytes = holdsRecords ? kRecordBytes : kPackedValueBytes;
  const std::size_t count = data.size() / valueBytes;
  if (count == 0 || data.size() != count * valueBytes || count > kValuesPerChunk) refuseForm();
  if (!holdsRecords) {
    const auto offsetBytes = static_cast<std::int64_t>(count * kPackedOffsetBytes);
    if (active_->integer(kOffsetBytes) != offsetBytes) refuseForm();
    return {data, wantsOffsets ? active_->bytes(kOffsets) : std::string_view()};
  }
  unpackedValues_.clear();
  unpackedOffsets_.clear();
  for (std::size_t at = 0; at < data.size(); at += kRecordBytes) {
    unpackedValues_ += data.substr(at, kPackedValueBytes);
    unpackedOffsets_ += data.substr(at + kPackedValueBytes, kPackedOffsetBytes);
  }
  return {unpackedValues_, unpackedOffsets_};
}

}  // namespace tavrel
