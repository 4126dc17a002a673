#include "platform/linux/store/sqlite_erasure.h"

#include <algorithm>
#include <optional>
#include <utility>
#include <vector>

#include "platform/linux/files/file_system.h"
#include "platform/linux/store/chunk_runs.h"
#include "platform/linux/store/sqlite_schema.h"

namespace tavrel {
namespace {

// The most that one transaction removes, although a single distribution may have more chunks.
constexpr int kRowsAtOnce = 512;
constexpr std::int64_t kChunksAtOnce = 4096;

// Pages that one transaction overwrites: 1 MiB at the usual page size.
constexpr std::int64_t kPagesAtOnce = 256;

constexpr off_t kLogBytes = 1 << 20;

// The largest store that is copied. Other writers wait for a second or two meanwhile.
constexpr std::int64_t kCopiedBytes = 64 << 20;

std::string statement(std::string_view before, std::string_view table, std::string_view after) {
  std::string sql(before);
  sql += table;
  sql += after;
  return sql;
}

/// The first day from `day` on that has a row. Skips text and blobs, which damage may leave in the
/// column.
std::optional<std::int64_t> nextDay(SqliteConnection& connection, std::string_view table,
                                    std::int64_t day) {
  SqliteStatement rows(connection,
                       statement("SELECT day FROM ", table,
                                 " WHERE day BETWEEN ?1 AND 2147483647 ORDER BY day LIMIT 1"));
  rows.bind(1, day);
  if (!rows.step()) return std::nullopt;
  return rows.integer(0);
}

std::vector<std::string> nextKeys(SqliteConnection& connection, std::string_view table,
                                  std::int64_t day, const std::string& prefix) {
  SqliteStatement rows(connection,
                       statement("SELECT key FROM ", table,
                                 " WHERE day = ?1 AND key >= ?2 AND (?3 IS NULL OR key < ?3) "
                                 "ORDER BY key LIMIT ?4"));
  const auto above = store_sql::keyAbove(prefix);
  rows.bind(1, day);
  rows.bind(2, std::string_view(prefix));
  if (above) {
    rows.bind(3, std::string_view(*above));
  } else {
    rows.bindNull(3);
  }
  rows.bind(4, kRowsAtOnce);
  std::vector<std::string> keys;
  while (rows.step())
    keys.emplace_back(rows.bytes(0));
  return keys;
}

}  // namespace

StoreErasure::StoreErasure(SqliteConnection& connection, std::string storePath)
    : connection_(connection), path_(std::move(storePath)) {
  // Overwrites pages that become free, too.
  connection_.execute("PRAGMA secure_delete = ON");
}

void StoreErasure::limitLog() {
  const auto log = FileSystem::status(path_ + "-wal");
  if (log && log->st_size > kLogBytes)
    connection_.checkpoint(false, SqliteConnection::LogFile::CutOff);
}

bool StoreErasure::hasLeftPages(SqliteConnection& connection) {
  return connection.integer("SELECT count(*) FROM sqlite_schema WHERE name = 'erased'") > 0;
}

void StoreErasure::dropPages(SqliteConnection& connection) {
  connection.execute("DROP TABLE IF EXISTS erased");
}

// Fills all free pages with rows of zeros, then frees them again.
void StoreErasure::clearFreePages() {
  dropPages(connection_);
  std::int64_t free = connection_.integer("PRAGMA freelist_count");
  if (free == 0) return;
  const std::int64_t pageBytes = connection_.integer("PRAGMA page_size");
  connection_.execute("CREATE TABLE erased (zeros BLOB)");
  SqliteStatement fill(connection_, "INSERT INTO erased (zeros) VALUES (zeroblob(?1))");
  while (free > 0) {
    const std::int64_t pages = std::min(free, kPagesAtOnce);
    fill.bind(1, pages * pageBytes);
    fill.run();
    limitLog();
    free = std::min(free - pages, connection_.integer("PRAGMA freelist_count"));
  }
  connection_.execute("PRAGMA secure_delete = OFF; DROP TABLE erased; PRAGMA secure_delete = ON");
}

ErasedRows StoreErasure::eraseRows(const RowRange& range) {
  ErasedRows erased;
  for (const std::string_view table : {"scalars", "distributions"})
    eraseTable(table, range, erased);
  return erased;
}

void StoreErasure::eraseTable(std::string_view table, const RowRange& range, ErasedRows& erased) {
  auto day = nextDay(connection_, table, range.firstDay);
  while (day && *day <= range.lastDay) {
    if (!eraseSome(table, *day, range.prefix, erased)) {
      day = nextDay(connection_, table, *day + 1);
    }
  }
}

// False when the day has no more such rows.
bool StoreErasure::eraseSome(std::string_view table, std::int64_t day, const std::string& prefix,
                             ErasedRows& erased) {
  ErasedRows sum = erased;
  connection_.execute("BEGIN IMMEDIATE");
  const auto keys = nextKeys(connection_, table, day, prefix);
  if (table == "distributions") {
    eraseDistributions(day, keys, sum);
  } else {
    eraseScalars(day, keys, sum);
  }
  connection_.execute("COMMIT");
  erased = sum;
  limitLog();
  return !keys.empty();
}

void StoreErasure::eraseScalars(std::int64_t day, const std::vector<std::string>& keys,
                                ErasedRows& erased) {
  SqliteStatement removeRow(connection_, "DELETE FROM scalars WHERE day = ?1 AND key = ?2");
  for (const std::string& key : keys) {
    removeRow.bind(1, day);
    removeRow.bind(2, std::string_view(key));
    removeRow.runOnFound();
    ++erased.scalars;
  }
}

// Leaves the last ones to the next transaction when there are too many chunks.
void StoreErasure::eraseDistributions(std::int64_t day, const std::vector<std::string>& keys,
                                      ErasedRows& erased) {
  SqliteStatement row(connection_,
                      "SELECT count, runs FROM distributions WHERE day = ?1 AND key = ?2");
  SqliteStatement removeChunks(connection_, "DELETE FROM chunks WHERE chunk >= ?1 AND chunk < ?2");
  SqliteStatement removeRow(connection_, "DELETE FROM distributions WHERE day = ?1 AND key = ?2");
  std::int64_t chunks = 0;
  for (const std::string& key : keys) {
    if (chunks >= kChunksAtOnce) break;
    row.bind(1, day);
    row.bind(2, std::string_view(key));
    if (row.step()) {
      const std::int64_t count = row.integer(0);
      auto runs = unpackRuns(row.bytes(1));
      // The chunks that a damaged row refers to may belong to another row.
      if (runs && valuesIn(*runs) != count) runs.reset();
      ++erased.distributions;
      erased.values += static_cast<std::uint64_t>(std::max<std::int64_t>(count, 0));
      erased.damaged += runs ? 0U : 1U;
      for (const ChunkRun& run : runs.value_or(std::vector<ChunkRun>())) {
        removeChunks.bind(1, run.first);
        removeChunks.bind(2, run.end());
        removeChunks.run();
        chunks += run.end() - run.first;
      }
    }
    row.reset();
    removeRow.bind(1, day);
    removeRow.bind(2, std::string_view(key));
    removeRow.runOnFound();
  }
}

void StoreErasure::eraseStrayChunks() {
  bool isDone = false;
  while (!isDone) {
    connection_.execute("BEGIN IMMEDIATE");
    // Chunks that another process has recorded in the meantime have rows.
    if (connection_.integer("SELECT count(*) FROM (SELECT 1 FROM distributions LIMIT 1)") == 0) {
      SqliteStatement remove(
          connection_, "DELETE FROM chunks WHERE chunk IN (SELECT chunk FROM chunks LIMIT ?1)");
      remove.bind(1, kChunksAtOnce);
      remove.run();
      isDone = connection_.integer("SELECT changes()") == 0;
    } else {
      isDone = true;
    }
    connection_.execute("COMMIT");
    limitLog();
  }
}

bool StoreErasure::copyPages() {
  const std::int64_t used =
      connection_.integer("PRAGMA page_count") - connection_.integer("PRAGMA freelist_count");
  if (used > kCopiedBytes / connection_.integer("PRAGMA page_size")) return false;
  connection_.execute("VACUUM");
  return true;
}

}  // namespace tavrel
