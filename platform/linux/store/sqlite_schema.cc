#include "platform/linux/store/sqlite_schema.h"

#include <cerrno>
#include <ctime>
#include <fcntl.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <unistd.h>

#include "base/system_text.h"
#include "platform/linux/files/descriptor.h"
#include "platform/linux/store/chunk_runs.h"
#include "platform/linux/store/sqlite_log_file.h"
#include "platform/linux/store/sqlite_site.h"

namespace tavrel {
namespace {

// For a new store, whatever the library's defaults. Small pages, because a commit writes whole
// ones. Incremental vacuum, to give back the pages of removed days a few at a time.
constexpr const char* kPages = "PRAGMA page_size = 4096; PRAGMA auto_vacuum = INCREMENTAL";

// Keys are blobs: they are compared byte by byte and may hold any byte.
constexpr const char* kScalarsTable = R"(
CREATE TABLE scalars (
  day INTEGER NOT NULL,
  key BLOB NOT NULL,
  value INTEGER NOT NULL,
  PRIMARY KEY (day, key)
) STRICT, WITHOUT ROWID)";
constexpr const char* kDistributionsTable = R"(
CREATE TABLE distributions (
  day INTEGER NOT NULL,
  key BLOB NOT NULL,
  count INTEGER NOT NULL,
  runs BLOB NOT NULL,
  PRIMARY KEY (day, key)
) STRICT, WITHOUT ROWID)";
constexpr const char* kChunksTable = R"(
CREATE TABLE chunks (
  chunk INTEGER PRIMARY KEY,
  data BLOB NOT NULL
) STRICT)";
constexpr const char* kSegmentsTable = R"(
CREATE TABLE segments (
  owner INTEGER NOT NULL,
  identity BLOB NOT NULL,
  position BLOB NOT NULL,
  PRIMARY KEY (owner, identity)
) STRICT, WITHOUT ROWID)";
constexpr const char* kSetVersion = "PRAGMA user_version = 2";

bool isKnown(std::int64_t version) {
  return version >= kFirstSchemaVersion && version <= kSchemaVersion;
}

bool hasTables(SqliteConnection& connection) {
  return connection.integer("SELECT count(*) FROM sqlite_schema") != 0;
}

[[noreturn]] void refuseSchema(std::int64_t version) {
  if (version == 0) {
    throw StoreFailure{StoreFault::Foreign,
                       "holds the tables of another program and is left alone: move it away"};
  }
  throw StoreFailure{
      StoreFault::Foreign,
      "has schema version " + std::to_string(version) +
          ", which this program does not know (it knows 1 and 2), and is left alone: "
          "update tavrel, or move the file away"};
}

// Opening a pipe or a device instead of the store could block for ever.
bool checkIsFile(const std::string& path) {
  struct stat status;
  if (lstat(path.c_str(), &status) != 0) {
    if (errno == ENOENT || errno == ENOTDIR) return false;
    throw StoreFailure{StoreFault::Refused, "cannot be read: " + systemText(errno) +
                                                ": check owner and permissions of its folder"};
  }
  if (!S_ISREG(status.st_mode)) {
    throw StoreFailure{StoreFault::Foreign, S_ISLNK(status.st_mode)
                                                ? "is a symbolic link: move it away"
                                                : "is not a regular file: move it away"};
  }
  return true;
}

// A journal file exists when another program has switched the store to SQLite's rollback-journal
// mode.
bool hasLog(const std::string& path) {
  struct stat status;
  return logHoldsPages(path) ||
         (stat((path + "-journal").c_str(), &status) == 0 && status.st_size != 0);
}

// The file's version, waiting until any later change must alter it. Many file systems stamp changes
// with a clock that advances only every 10 ms: two changes within one step have the same time.
std::optional<FileVersion> settledVersion(const std::string& path) {
  constexpr std::int64_t kStep = 20'000'000;  // nanoseconds, with a margin
  constexpr timespec kPause{0, kStep};
  for (int attempt = 0;; ++attempt) {
    const auto version = FileVersion::of(path);
    timespec now{};
    clock_gettime(CLOCK_REALTIME, &now);
    // A time in the future means that the clock was set back: waiting would not help.
    const bool isRecent =
        version && (now.tv_sec - version->seconds == 0 || now.tv_sec - version->seconds == 1) &&
        (now.tv_sec - version->seconds) * 1'000'000'000 + now.tv_nsec - version->nanoseconds <
            kStep;
    if (!isRecent || attempt == 3) return version;
    nanosleep(&kPause, nullptr);
  }
}

void setUpForWriting(SqliteConnection& connection) {
  // Each commit is flushed: what was reported as kept also survives a power cut.
  connection.execute("PRAGMA journal_mode = WAL; PRAGMA synchronous = FULL");
  // SQLite's automatic checkpoint leaves the log's content in place. The next process to open the
  // store would not know that it has been moved, and would move it again.
  connection.execute("PRAGMA wal_autocheckpoint = 0");
}

// Users who may only read the store can use the log if an index file exists, whatever its content.
// SQLite creates none for a connection that keeps all others out.
void provideIndexFile(const std::string& path) {
  const std::string index = path + "-shm";
  struct stat status;
  if (stat(index.c_str(), &status) == 0 || stat(path.c_str(), &status) != 0) return;
  const Descriptor made(open(index.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600));
  if (!made) return;
  const bool isOwners = geteuid() != 0 || fchown(made.get(), status.st_uid, status.st_gid) == 0;
  if (isOwners) fchmod(made.get(), status.st_mode & 0666);
}

// Opens the store for this process alone; nothing when that would need waiting, creating or
// converting it.
std::optional<SqliteConnection> openAlone(const std::string& path) {
  try {
    SqliteConnection connection(path, SqliteConnection::Access::WriteAlone,
                                std::make_shared<BusyBudget>(0));
    if (schemaVersion(connection) != kSchemaVersion) return std::nullopt;
    setUpForWriting(connection);
    provideIndexFile(path);
    return connection;
  } catch (const StoreFailure&) {
    // Opening the store in the usual way will report the failure.
    return std::nullopt;
  }
}

// True when the store has tables to read.
bool isReadable(SqliteConnection& connection) {
  const std::int64_t version = schemaVersion(connection);
  if (isKnown(version)) return true;
  if (version != 0 || hasTables(connection)) refuseSchema(version);
  return false;
}

}  // namespace

std::optional<std::string> store_sql::keyAbove(std::string_view prefix) {
  std::string above(prefix);
  while (!above.empty() && above.back() == '\xFF')
    above.pop_back();
  if (above.empty()) return std::nullopt;
  above.back() = static_cast<char>(static_cast<unsigned char>(above.back()) + 1);
  return above;
}

std::string store_sql::scalars(std::string_view rows) {
  return std::string("SELECT key, day, value FROM scalars ").append(rows);
}

std::string store_sql::distributions(std::string_view rows, std::int64_t version) {
  const std::string place = version == 1 ? "series" : "runs";
  return ("SELECT key, day, count, " + place + " FROM distributions ").append(rows);
}

std::int64_t schemaVersion(SqliteConnection& connection) {
  return connection.integer("PRAGMA user_version");
}

void migrate(SqliteConnection& connection) {
  try {
    connection.execute("ALTER TABLE distributions RENAME TO series");
    connection.execute(kDistributionsTable);
    {
      SqliteStatement from(connection, "SELECT day, key, count, series FROM series");
      SqliteStatement to(
          connection, "INSERT INTO distributions (day, key, count, runs) VALUES (?1, ?2, ?3, ?4)");
      std::string runs;
      while (from.step()) {
        runs.clear();
        const std::int64_t count = from.integer(2);
        // A row that refers to no chunks gets no run, and stays like that.
        const auto run = runOfSeries(from.integer(3), count);
        if (run && count > 0) appendRun(runs, *run);
        to.bind(1, from.integer(0));
        to.bind(2, from.bytes(1));
        to.bind(3, count);
        to.bind(4, std::string_view(runs));
        to.run();
      }
    }
    // The chunks stay: only the rows that refer to them are rewritten.
    connection.execute("DROP TABLE series");
    connection.execute(kSegmentsTable);
    connection.execute(kSetVersion);
    connection.execute("COMMIT");
  } catch (const StoreFailure& failure) {
    throw StoreFailure{
        failure.fault,
        "cannot be converted to schema version 2 and stays readable: " + failure.message};
  }
}

SqliteConnection openStoreForWriting(const std::string& path,
                                     const std::shared_ptr<BusyBudget>& busy, Sharing sharing) {
  // SQLite would create a store that everybody can read, and gives its log files the store's mode.
  // An existing store is not opened here: closing it would release SQLite's locks.
  if (!checkIsFile(path)) {
    const Descriptor made(open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0640));
  }
  withholdFromOthers(path);
  if (sharing == Sharing::Avoided) {
    if (auto connection = openAlone(path)) return std::move(*connection);
  }
  SqliteConnection connection(path, SqliteConnection::Access::Create, busy);
  std::int64_t version = schemaVersion(connection);
  if (version == 0) {
    const StoreFolderLock lock(path, *busy);
    version = schemaVersion(connection);
    if (version == 0) {
      if (hasTables(connection)) refuseSchema(version);
      connection.execute(kPages);
      connection.execute("PRAGMA journal_mode = WAL; BEGIN IMMEDIATE");
      for (const char* statement :
           {kScalarsTable, kDistributionsTable, kChunksTable, kSegmentsTable, kSetVersion}) {
        connection.execute(statement);
      }
      connection.execute("COMMIT");
      version = schemaVersion(connection);
    }
  }
  if (!isKnown(version)) refuseSchema(version);
  setUpForWriting(connection);
  return connection;
}

std::optional<ReadableStore> openStoreForReading(const std::string& path,
                                                 const std::shared_ptr<BusyBudget>& busy,
                                                 bool leavesNoTrace) {
  if (!checkIsFile(path)) return std::nullopt;
  // Taken before looking at the log: whatever a writer moves from the log into the file after this
  // changes the version.
  const auto version = leavesNoTrace ? settledVersion(path) : FileVersion::of(path);
  using Access = SqliteConnection::Access;
  const auto openAs = [&](Access access) -> std::optional<ReadableStore> {
    SqliteConnection connection(path, access, busy);
    if (!isReadable(connection)) return std::nullopt;
    return ReadableStore{std::move(connection),
                         access == Access::Immutable ? version : std::nullopt};
  };
  if (leavesNoTrace && version && !hasLog(path)) return openAs(Access::Immutable);
  try {
    return openAs(Access::Read);
  } catch (const StoreFailure& failure) {
    // Using the log needs files in the store's folder, and room for them.
    if (failure.fault != StoreFault::Refused && failure.fault != StoreFault::Device) throw;
    if (hasLog(path)) {
      if (failure.fault == StoreFault::Device) return openAs(Access::ReadAlone);
      if (faccessat(AT_FDCWD, path.c_str(), R_OK, AT_EACCESS) != 0) throw;
      throw StoreFailure{failure.fault,
                         failure.message +
                             "; its write-ahead log is only readable where the folder can be "
                             "written: have a user who may write run 'tavrelctl stat list' once"};
    }
  }
  // Without a log, everything is in the file itself.
  return openAs(Access::Immutable);
}

}  // namespace tavrel
