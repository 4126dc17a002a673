#include "platform/linux/store/sqlite_schema.h"

#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <sqlite3.h>
#include <sys/stat.h>

#include "platform/linux/files/descriptor.h"
#include "platform/linux/store/sqlite_site.h"

namespace tavrel {
namespace {

constexpr std::int64_t kSchemaVersion = 1;

// For a new store. Reading values is as fast as the system delivers pages: twice as fast in 64 KiB
// as in SQLite's 4 KiB. Commits, which write whole pages, are few.
constexpr const char* kPageSize = "PRAGMA page_size = 65536";

// The log is moved into the database when it is longer than 4 MiB, as with pages of 4 KiB.
constexpr const char* kAutomaticCheckpoint = "PRAGMA wal_autocheckpoint = 64";

// Keys are blobs: they are compared byte by byte and may hold any byte.
constexpr const char* kSchema = R"(
CREATE TABLE scalars (
  day INTEGER NOT NULL,
  key BLOB NOT NULL,
  value INTEGER NOT NULL,
  PRIMARY KEY (day, key)
) STRICT, WITHOUT ROWID;
CREATE TABLE distributions (
  day INTEGER NOT NULL,
  key BLOB NOT NULL,
  series INTEGER NOT NULL,
  count INTEGER NOT NULL,
  PRIMARY KEY (day, key)
) STRICT, WITHOUT ROWID;
CREATE TABLE chunks (
  chunk INTEGER PRIMARY KEY,
  data BLOB NOT NULL
) STRICT;
PRAGMA user_version = 1;
)";

std::int64_t schemaVersion(SqliteConnection& connection) {
  return connection.integer("PRAGMA user_version");
}

bool hasTables(SqliteConnection& connection) {
  return connection.integer("SELECT count(*) FROM sqlite_schema") != 0;
}

[[noreturn]] void refuseSchema(std::int64_t version) {
  if (version == 0) {
    throw StoreFailure{StoreFault::Foreign,
                       "holds the tables of another program and is left alone: move it away"};
  }
  throw StoreFailure{StoreFault::Foreign,
                     "has schema version " + std::to_string(version) +
                         ", which this program does not know (it knows 1), and is left alone: "
                         "update tavrel, or move the file away"};
}

// Opening a pipe or a device in place of the store could block for ever.
bool checkIsFile(const std::string& path) {
  struct stat status;
  if (stat(path.c_str(), &status) != 0) {
    if (errno == ENOENT || errno == ENOTDIR) return false;
    throw StoreFailure{StoreFault::Refused, std::string("cannot be read: ") + std::strerror(errno) +
                                                ": check owner and permissions of its folder"};
  }
  if (!S_ISREG(status.st_mode)) {
    throw StoreFailure{StoreFault::Foreign, "is not a regular file: move it away"};
  }
  return true;
}

// A journal is left where another program has put the store in SQLite's older mode.
bool hasLog(const std::string& path) {
  struct stat status;
  for (const char* suffix : {"-wal", "-journal"}) {
    if (stat((path + suffix).c_str(), &status) == 0 && status.st_size != 0) return true;
  }
  return false;
}

// True when the store has tables to read.
bool isReadable(SqliteConnection& connection) {
  const std::int64_t version = schemaVersion(connection);
  if (version == kSchemaVersion) return true;
  if (version != 0 || hasTables(connection)) refuseSchema(version);
  return false;
}

}  // namespace

SqliteConnection openStoreForWriting(const std::string& path,
                                     const std::shared_ptr<BusyBudget>& busy) {
  // SQLite gives its log files the mode of the store, and would create a store that all can read.
  // An existing store is not opened for this: closing it would give up SQLite's locks.
  if (!checkIsFile(path)) {
    const Descriptor made(open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0640));
  }
  withholdFromOthers(path);
  SqliteConnection connection(path, SqliteConnection::Access::Create, busy);
  std::int64_t version = schemaVersion(connection);
  if (version == 0) {
    const StoreFolderLock lock(path, *busy);
    version = schemaVersion(connection);
    if (version == 0) {
      if (hasTables(connection)) refuseSchema(version);
      connection.execute(kPageSize);
      connection.execute("PRAGMA journal_mode = WAL; BEGIN IMMEDIATE");
      connection.execute(kSchema);
      connection.execute("COMMIT");
      version = schemaVersion(connection);
    }
  }
  if (version != kSchemaVersion) refuseSchema(version);
  // Commits are few and hold a whole run's values, so each is flushed: what was reported as kept
  // also survives a power cut.
  connection.execute("PRAGMA journal_mode = WAL; PRAGMA synchronous = FULL");
  connection.execute(kAutomaticCheckpoint);
  return connection;
}

std::optional<ReadableStore> openStoreForReading(const std::string& path,
                                                 const std::shared_ptr<BusyBudget>& busy,
                                                 bool leavesNoTrace) {
  if (!checkIsFile(path)) return std::nullopt;
  // Taken before looking at the log: whatever a writer moves from the log into the file after this
  // changes the version.
  const auto version = FileVersion::of(path);
  const auto openLockless = [&]() -> std::optional<ReadableStore> {
    SqliteConnection connection(path, SqliteConnection::Access::Immutable, busy);
    if (!isReadable(connection)) return std::nullopt;
    return ReadableStore{std::move(connection), version};
  };
  if (leavesNoTrace && version && !hasLog(path)) return openLockless();
  try {
    SqliteConnection connection(path, SqliteConnection::Access::Read, busy);
    if (!isReadable(connection)) return std::nullopt;
    return ReadableStore{std::move(connection), std::nullopt};
  } catch (const StoreFailure& failure) {
    // Using the log needs files in the store's folder, and room for them.
    if (failure.fault != StoreFault::Refused && failure.fault != StoreFault::Device) throw;
    if (hasLog(path)) {
      if (failure.fault == StoreFault::Device) throw;
      throw StoreFailure{failure.fault,
                         failure.message +
                             "; its write-ahead log is only readable where the folder can be "
                             "written: have a user who may write run 'tavrelctl stat list' once"};
    }
  }
  // Without a log, everything is in the file itself.
  return openLockless();
}

}  // namespace tavrel
