// The store's schema and its statements, and opening a file that has it. docs/store.md describes
// the tables for users of other tools.
#pragma once

#include <cstddef>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "platform/linux/store/sqlite_connection.h"
#include "platform/linux/store/sqlite_site.h"

namespace tavrel {

namespace store_sql {

/// ?1 day, ?2 lowest key. The rows come from one walk along the primary key.
inline constexpr std::string_view kScalarsOfDay =
    "SELECT key, day, value FROM scalars WHERE day = ?1 AND key >= ?2 ORDER BY key";
inline constexpr std::string_view kDistributionsOfDay =
    "SELECT key, day, series, count FROM distributions WHERE day = ?1 AND key >= ?2 ORDER BY key";

/// ?1 first day, ?2 last day, ?3 lowest key, ?4 the key above the highest or null.
inline constexpr std::string_view kScalarsByKey =
    "SELECT key, day, value FROM scalars WHERE day BETWEEN ?1 AND ?2 AND key >= ?3 "
    "AND (?4 IS NULL OR key < ?4) ORDER BY key, day";
inline constexpr std::string_view kDistributionsByKey =
    "SELECT key, day, series, count FROM distributions WHERE day BETWEEN ?1 AND ?2 AND key >= ?3 "
    "AND (?4 IS NULL OR key < ?4) ORDER BY key, day";

/// As above, in the order in which the rows are kept.
inline constexpr std::string_view kScalarsByDay =
    "SELECT key, day, value FROM scalars WHERE day BETWEEN ?1 AND ?2 AND key >= ?3 "
    "AND (?4 IS NULL OR key < ?4) ORDER BY day, key";
inline constexpr std::string_view kDistributionsByDay =
    "SELECT key, day, series, count FROM distributions WHERE day BETWEEN ?1 AND ?2 AND key >= ?3 "
    "AND (?4 IS NULL OR key < ?4) ORDER BY day, key";

/// ?1 day, ?2 key, ?3 last day. The first row that is not before that key of that day.
inline constexpr std::string_view kNextScalar =
    "SELECT key, day, value FROM scalars WHERE (day, key) >= (?1, ?2) AND day <= ?3 "
    "ORDER BY day, key LIMIT 1";
inline constexpr std::string_view kNextDistribution =
    "SELECT key, day, series, count FROM distributions WHERE (day, key) >= (?1, ?2) AND day <= ?3 "
    "ORDER BY day, key LIMIT 1";

/// ?1 first chunk, ?2 chunk behind the last.
inline constexpr std::string_view kChunks =
    "SELECT data FROM chunks WHERE chunk >= ?1 AND chunk < ?2 ORDER BY chunk";

}  // namespace store_sql

/// A chunk's number is its series' number and, in the low bits, its place in the series.
inline constexpr int kChunkOrdinalBits = 20;

/// Every chunk of a series but the last is full. 12 KiB is little enough that one more value does
/// not rewrite much, and enough that a million values take a thousand steps to read; five chunks
/// fill a page.
inline constexpr std::size_t kValuesPerChunk = 1024;

/// Opens the store for writing and gives an empty file the schema. The folder must exist.
SqliteConnection openStoreForWriting(const std::string& path,
                                     const std::shared_ptr<BusyBudget>& busy);

struct ReadableStore {
  SqliteConnection connection;
  /// The file as it was before a read without locks and without a log; otherwise nothing. What was
  /// read is valid if this has not changed.
  std::optional<FileVersion> lockless;
};

/// Opens the store for reading; nothing when there is none yet. With `leavesNoTrace`, a file whose
/// log is empty is read without locks, so that no log files appear beside it.
std::optional<ReadableStore> openStoreForReading(const std::string& path,
                                                 const std::shared_ptr<BusyBudget>& busy,
                                                 bool leavesNoTrace = false);

}  // namespace tavrel
