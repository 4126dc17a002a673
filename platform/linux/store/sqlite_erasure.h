// Removes rows from the statistics store so that their content is gone from its files.
//
// It works in short transactions, between which others read and write. A process that is killed
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

#include "platform/linux/store/sqlite_connection.h"

namespace tavrel {

/// Rows by the beginning of their keys and by their days, both included; by default all.
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
  /// Distributions whose rows do not say where their values are; those stay in the file.
  std::uint64_t damaged = 0;
  /// Whether all pages were written again. Otherwise parts of pages that hold no row may still have
  /// bytes of removed rows, from when SQLite moved these to other pages.
  bool isCopied = true;
  /// Whether the write-ahead log, with what the pages held before, is gone.
  bool isLogEmpty = true;
};

/// The operations throw `StoreFailure`. The connection must outlive it, and the store must have the
/// present schema.
class StoreErasure {
 public:
  StoreErasure(SqliteConnection& connection, std::string storePath);

  /// Overwrites the pages that are free now: they may hold what was removed earlier. The caller
  /// holds a `StoreFolderLock`, as for `dropPages`.
  void clearFreePages();
  /// Whether an erasure is at that, or was killed, and so holds pages; and their end.
  static bool hasLeftPages(SqliteConnection& connection);
  static void dropPages(SqliteConnection& connection);
  ErasedRows eraseRows(const RowRange& range);
  /// Removes values to which no row refers, when there are no rows.
  void eraseStrayChunks();
  /// Writes what is left into new pages and gives the others back to the file system. False, and
  /// nothing is done, for a store that would keep other writers waiting for long.
  bool copyPages();
  /// False while other processes need the log.
  bool emptyLog() { return connection_.checkpoint(true, SqliteConnection::LogFile::CutOff); }

 private:
  void eraseTable(std::string_view table, const RowRange& range, ErasedRows& erased);
  bool eraseSome(std::string_view table, std::int64_t day, const std::string& prefix,
                 ErasedRows& erased);
  void limitLog();

  SqliteConnection& connection_;
  const std::string path_;
};

}  // namespace tavrel
