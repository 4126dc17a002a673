// Reads the values of a distribution, one chunk at a time.
//
//   ChunkReader reader(connection, schemaVersion(connection));
//   reader.begin(runs, count);
//   while (const auto block = reader.next(false)) use(block->values);
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "platform/distribution_values.h"
#include "platform/linux/store/chunk_runs.h"
#include "platform/linux/store/sqlite_connection.h"

namespace tavrel {

/// The operations throw a `StoreFailure` that does not name the distribution.
class ChunkReader {
 public:
  /// The connection must outlive the reader. `version` is that of the store's schema.
  ChunkReader(const SqliteConnection& connection, std::int64_t version)
      : connection_(connection), version_(version) {}
  ~ChunkReader() { end(); }
  ChunkReader(const ChunkReader&) = delete;
  ChunkReader& operator=(const ChunkReader&) = delete;

  /// Refuses runs that do not hold `count` values.
  void begin(std::vector<ChunkRun> runs, std::int64_t count);
  /// The next values, valid until the next call; nothing when all have been read.
  std::optional<DistributionBlock> next(bool wantsOffsets);
  /// Gives up what has not been read.
  void end();

 private:
  bool step(bool wantsOffsets);
  DistributionBlock blockAt(bool wantsOffsets);
  [[noreturn]] void refuseCount() const;

  const SqliteConnection& connection_;
  std::int64_t version_;
  // Made when they are first needed.
  std::optional<SqliteStatement> values_;
  std::optional<SqliteStatement> valuesAndOffsets_;
  SqliteStatement* active_ = nullptr;  // the one that is at a row

  std::vector<ChunkRun> runs_;  // what is left of them
  std::size_t run_ = 0;
  std::int64_t count_ = 0;
  std::int64_t read_ = 0;
  std::string unpackedValues_;
  std::string unpackedOffsets_;
};

}  // namespace tavrel
