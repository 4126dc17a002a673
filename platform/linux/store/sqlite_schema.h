// The store's schema and statements, and how a file with that schema is opened. docs/store.md
// describes the tables for users of other tools.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "platform/linux/store/sqlite_connection.h"
#include "platform/linux/store/sqlite_site.h"

namespace tavrel {

/// The versions of the schema that this program reads. It writes the later one.
inline constexpr std::int64_t kFirstSchemaVersion = 1;
inline constexpr std::int64_t kSchemaVersion = 2;

namespace store_sql {

/// ?1 day, ?2 lowest key. The rows come from one walk along the primary key.
inline constexpr std::string_view kOfDay = "WHERE day = ?1 AND key >= ?2 ORDER BY key";

/// ?1 first day, ?2 last day, ?3 lowest key, ?4 the key above the highest or null.
inline constexpr std::string_view kByKey =
    "WHERE day BETWEEN ?1 AND ?2 AND key >= ?3 AND (?4 IS NULL OR key < ?4) ORDER BY key, day";

/// As above, in the order in which the rows are stored.
inline constexpr std::string_view kByDay =
    "WHERE day BETWEEN ?1 AND ?2 AND key >= ?3 AND (?4 IS NULL OR key < ?4) ORDER BY day, key";

/// ?1 day, ?2 key, ?3 last day. The first row that is not before that key of that day.
inline constexpr std::string_view kNext =
    "WHERE (day, key) >= (?1, ?2) AND day <= ?3 ORDER BY day, key LIMIT 1";

/// A query with one of the above for `rows`, which yields key, day and value.
std::string scalars(std::string_view rows);

/// A query with one of the above for `rows`, which yields key, day, count and the location of the
/// values: runs (chunk_runs.h), or a series in version 1.
std::string distributions(std::string_view rows, std::int64_t version);

/// The first key above every key that begins with `prefix`; nothing when there is none.
std::optional<std::string> keyAbove(std::string_view prefix);

/// ?1 first chunk, ?2 the one after the last.
inline constexpr std::string_view kChunks =
    "SELECT chunk, data FROM chunks WHERE chunk >= ?1 AND chunk < ?2 ORDER BY chunk";

}  // namespace store_sql

/// The version of the store's schema; 0 for an empty file.
std::int64_t schemaVersion(SqliteConnection& connection);

/// Gives a store of version 1 the present schema, within the current transaction, and commits it.
void migrate(SqliteConnection& connection);

enum class Sharing : std::uint8_t {
  WithReaders,
  /// Readers wait until the connection is closed; if the store already has one, it is shared after
  /// all. The log's index is then in memory, so that no index file wears out the flash. For short
  /// changes.
  Avoided,
};

/// Opens the store for writing and gives an empty file the schema; a store of version 1 keeps its
/// own. The folder must exist.
SqliteConnection openStoreForWriting(const std::string& path,
                                     const std::shared_ptr<BusyBudget>& busy,
                                     Sharing sharing = Sharing::WithReaders);

struct ReadableStore {
  SqliteConnection connection;
  /// Set for a read without locks and log: the file before that read. What was read is valid only
  /// if the file still has this version.
  std::optional<FileVersion> lockless;
};

/// Opens the store for reading; nothing when there is none yet. With `leavesNoTrace`, a file whose
/// log is empty is read without locks, so that no log files appear beside it.
std::optional<ReadableStore> openStoreForReading(const std::string& path,
                                                 const std::shared_ptr<BusyBudget>& busy,
                                                 bool leavesNoTrace = false);

}  // namespace tavrel
