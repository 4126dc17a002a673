// Removes rows from the statistics store and their content from its files.
//
// It works in short transactions, between which others can read and write. A process that is killed
// has removed some rows; the next erasure removes the rest.
//
//   StoreErasure erasure(connection, path);
//   erasure.clearFreePages();
//   const ErasedRows erased = erasure.eraseRows({.prefix = "com.example."});
//   if (!erasure.emptyLog()) ...
#pragma once

#include <cstdint>
#include <limits>
#include <string>
#include <string_view>
#include <vector>

#include "platform/linux/store/sqlite_connection.h"

namespace tavrel {

/// Rows by key prefix and by first and last day, both included; by default all rows.
struct RowRange {
  std::string prefix;
  std::int32_t firstDay = std::numeric_limits<std::int32_t>::min();
  std::int32_t lastDay = std::numeric_limits<std::int32_t>::max();

  bool operator==(const RowRange&) const = default;
};

struct ErasedRows {
  std::uint64_t scalars = 0;
  std::uint64_t distributions = 0;
  std::uint64_t values = 0;  // of those distributions
  /// Distributions with damaged rows, which no longer say where their values are; those values stay
  /// in the file.
  std::uint64_t damaged = 0;
  /// Whether all pages were rewritten. Otherwise unused parts of pages may still hold bytes of
  /// removed rows that SQLite once moved to other pages.
  bool isCopied = true;
  /// Whether the write-ahead log, with what the pages held before, is gone.
  bool isLogEmpty = true;
};

/// The operations throw `StoreFailure`. The connection must outlive it, and the store must have the
/// present schema.
class StoreErasure {
 public:
  StoreErasure(SqliteConnection& connection, std::string storePath);

  /// Overwrites the pages that are free now, since they may hold rows removed earlier. The caller
  /// must hold a `StoreFolderLock`, as for `dropPages`.
  void clearFreePages();
  /// Whether an erasure holds free pages, because it is running or was killed; and their release.
  static bool hasLeftPages(SqliteConnection& connection);
  static void dropPages(SqliteConnection& connection);
  ErasedRows eraseRows(const RowRange& range);
  /// When there are no rows, removes all values: no row refers to them.
  void eraseStrayChunks();
  /// Rewrites the remaining content into new pages and gives the old ones back to the file system.
  /// Does nothing and returns false for a store so large that other writers would wait long.
  bool copyPages();
  /// False while other processes need the log.
  bool emptyLog() { return connection_.checkpoint(true, SqliteConnection::LogFile::CutOff); }

 private:
  void eraseTable(std::string_view table, const RowRange& range, ErasedRows& erased);
  bool eraseSome(std::string_view table, std::int64_t day, const std::string& prefix,
                 ErasedRows& erased);
  void eraseScalars(std::int64_t day, const std::vector<std::string>& keys, ErasedRows& erased);
  void eraseDistributions(std::int64_t day, const std::vector<std::string>& keys,
                          ErasedRows& erased);
  void limitLog();

  SqliteConnection& connection_;
  const std::string path_;
};

}  // namespace tavrel
