// Appends values to distributions of the store, inside a transaction.
//
//   DistributionWriter writer(connection);
//   writer.append(day, key, {values, offsets});
//
// New values go into new chunks. Runs of few values are joined with them (chunk_runs.h).
#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>

#include "platform/distribution_values.h"
#include "platform/linux/store/chunk_runs.h"
#include "platform/linux/store/sqlite_connection.h"

namespace tavrel {

/// A row cannot take values. Nothing has been changed, and other rows can still be written.
struct RowFailure : StoreFailure {
  using StoreFailure::StoreFailure;
};

class DistributionWriter {
 public:
  /// For one transaction. It and the connection must outlive the writer.
  explicit DistributionWriter(SqliteConnection& connection);

  /// Throws `RowFailure` when the row is damaged or full, otherwise `StoreFailure`.
  void append(std::int32_t day, std::string_view key, const DistributionBlock& added);

 private:
  struct Packed {
    std::string values;
    std::string offsets;
  };

  std::optional<Packed> takeOut(std::span<const ChunkRun> runs);
  ChunkRun writeRun(const DistributionBlock& block);
  void addChunks(std::string_view data, std::size_t bytesPerChunk);

  SqliteConnection& connection_;
  SqliteStatement getRuns_;
  SqliteStatement setRuns_;
  SqliteStatement addChunk_;
  std::int64_t nextChunk_ = -1;  // negative: not looked up yet
};

}  // namespace tavrel
