// Reads the values of a distribution, one chunk at a time.
//
//   ChunkReader reader(connection);
//   reader.begin(runs, count);
//   while (const auto block = reader.next(false)) use(block->values);
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/distribution_values.h"
#include "platform/linux/store/chunk_runs.h"
#include "platform/linux/store/sqlite_connection.h"

namespace tavrel {

/// Operations throw a `StoreFailure` that does not name the distribution.
class ChunkReader {
 public:
  /// The connection must outlive the reader.
  explicit ChunkReader(const SqliteConnection& connection)
      : values_(connection), offsets_(connection) {}
  ~ChunkReader() { end(); }
  ChunkReader(const ChunkReader&) = delete;
  ChunkReader& operator=(const ChunkReader&) = delete;

  /// Refuses runs that do not hold `count` values.
  void begin(std::vector<ChunkRun> runs, std::int64_t count);
  /// The next values, valid until the next call; nothing when all have been read.
  std::optional<DistributionBlock> next(bool wantsOffsets);
  /// Abandons the rest of the values.
  void end();

 private:
  // Steps through consecutive chunks.
  class Cursor {
   public:
    explicit Cursor(const SqliteConnection& connection) : connection_(connection) {}
    /// The data of `chunk`, valid until the next call. Chunks are expected to be asked for in turn,
    /// up to `last`. Nothing when there is no such chunk.
    std::optional<std::string_view> at(std::int64_t chunk, std::int64_t last);
    void end();

   private:
    const SqliteConnection& connection_;
    std::optional<SqliteStatement> rows_;  // made when it is first needed
    std::optional<std::int64_t> next_;     // the chunk that the statement yields next
  };

  DistributionBlock unpack(std::string_view records);
  [[noreturn]] void refuseCount() const;

  Cursor values_;
  Cursor offsets_;
  std::vector<ChunkRun> runs_;
  std::size_t run_ = 0;     // index of the current run
  std::int64_t chunk_ = 0;  // the next one of the current run
  std::int64_t count_ = 0;
  std::int64_t read_ = 0;
  std::string unpackedValues_;
  std::string unpackedOffsets_;
};

}  // namespace tavrel
