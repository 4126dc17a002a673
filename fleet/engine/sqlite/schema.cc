#include "fleet/engine/sqlite/schema.h"

#include <cstdint>
#include <fcntl.h>
#include <string_view>

#include "base/bytes.h"
#include "fleet/engine/engine.h"
#include "fleet/engine/regular_file.h"
#include "fleet/engine/sqlite/row_id.h"
#include "platform/linux/files/descriptor.h"

namespace tavrel::fleet {
namespace {

constexpr std::int64_t kApplicationId = 0x7461766C;  // "tavl"
constexpr std::int64_t kVersion = 1;
constexpr const char* kReadVersion = "PRAGMA user_version";

static_assert(kPlaceBits == 14 && kNameBits == 25, "the views below compute with these numbers");

// For `id` in the four tables of rows, see row_id.h; for columns without a type (doubles), real.h.
constexpr const char* kTables = R"(
CREATE TABLE log(id INTEGER PRIMARY KEY, digest BLOB NOT NULL UNIQUE, day INTEGER NOT NULL,
  created INTEGER NOT NULL, os_version TEXT NOT NULL, previous_os_version TEXT NOT NULL,
  config_number TEXT NOT NULL, whitelist_digest TEXT NOT NULL, task_id TEXT NOT NULL,
  language TEXT NOT NULL, preferred_language TEXT NOT NULL, region TEXT NOT NULL);
CREATE TABLE block(id INTEGER PRIMARY KEY, first_log INTEGER NOT NULL);

CREATE TABLE key(id INTEGER PRIMARY KEY, kind INTEGER NOT NULL, name TEXT NOT NULL,
  UNIQUE(kind, name));
CREATE TABLE bucket(id INTEGER PRIMARY KEY, key INTEGER NOT NULL REFERENCES key, lower, upper,
  label TEXT NOT NULL, UNIQUE(key, label));
CREATE TABLE application(id INTEGER PRIMARY KEY, bundle TEXT NOT NULL, version TEXT NOT NULL,
  uuid TEXT NOT NULL, orbo_id INTEGER NOT NULL, arch INTEGER NOT NULL,
  UNIQUE(bundle, version, uuid, orbo_id, arch));

CREATE TABLE scalar(id INTEGER PRIMARY KEY, value INTEGER NOT NULL);
CREATE TABLE distribution(id INTEGER PRIMARY KEY, minimum, maximum, mean, squared_deviations,
  count INTEGER NOT NULL);
CREATE TABLE cell(id INTEGER PRIMARY KEY, count INTEGER NOT NULL);
CREATE TABLE activation(id INTEGER PRIMARY KEY, times INTEGER NOT NULL);

CREATE VIEW logs AS
  SELECT id AS log, lower(hex(digest)) AS digest, day, date(day * 86400, 'unixepoch') AS date,
    created, os_version, previous_os_version, config_number, whitelist_digest, task_id, language,
    preferred_language, region
  FROM log;
CREATE VIEW scalars AS
  SELECT k.name AS key, b.first_log + (r.id & 16383) AS log, r.value
  FROM key k CROSS JOIN block b CROSS JOIN scalar r
    ON r.id BETWEEN (b.id << 39) + (k.id << 14) AND (b.id << 39) + (k.id << 14) + 16383
  WHERE k.kind = 0;
CREATE VIEW distributions AS
  SELECT k.name AS key, b.first_log + (r.id & 16383) AS log, r.minimum, r.maximum, r.mean,
    r.squared_deviations, r.count
  FROM key k CROSS JOIN block b CROSS JOIN distribution r
    ON r.id BETWEEN (b.id << 39) + (k.id << 14) AND (b.id << 39) + (k.id << 14) + 16383
  WHERE k.kind = 1;
CREATE VIEW cells AS
  SELECT k.name AS key, b.first_log + (r.id & 16383) AS log, u.lower, u.upper, u.label, r.count
  FROM key k CROSS JOIN bucket u ON u.key = k.id CROSS JOIN block b CROSS JOIN cell r
    ON r.id BETWEEN (b.id << 39) + (u.id << 14) AND (b.id << 39) + (u.id << 14) + 16383
  WHERE k.kind = 2;
CREATE VIEW applications AS
  SELECT a.bundle, a.version, a.uuid, a.orbo_id, a.arch, b.first_log + (r.id & 16383) AS log,
    r.times
  FROM application a CROSS JOIN block b CROSS JOIN activation r
    ON r.id BETWEEN (b.id << 39) + (a.id << 14) AND (b.id << 39) + (a.id << 14) + 16383;
)";

enum class Found { Nothing, Database };

constexpr std::string_view kMagic("SQLite format 3\0", 16);
constexpr std::size_t kHeaderBytes = 100;

// The header's numbers are big-endian.
std::uint32_t word(ByteSpan header, std::size_t at) {
  return __builtin_bswap32(loadLittle32(header, at).value_or(0));
}

void checkVersion(const std::string& path, std::int64_t version) {
  if (version == kVersion) return;
  throw EngineError(path + ": has tables of version " + std::to_string(version) +
                    ", and this program knows version " + std::to_string(kVersion) +
                    ": use the program that made it, or load the logs into a new file");
}

// Reads the file's header as bytes: merely by opening another program's file, SQLite would complete
// or roll back its changes.
Found look(const std::string& path) {
  const auto header = readBeginning(path, kHeaderBytes);
  if (!header || header->empty()) return Found::Nothing;
  const auto bytes = asBytes(*header);
  if (bytes.size() < kHeaderBytes || !header->starts_with(kMagic))
    throw EngineError(path + ": is not a database: name another file");
  if (word(bytes, 68) != kApplicationId)
    throw EngineError(path + ": is another program's database: name another file");
  checkVersion(path, word(bytes, 60));
  return Found::Database;
}

// The first transaction uses no write-ahead log, so that the header gets into the file itself.
void createTables(Connection& connection) {
  connection.execute("PRAGMA page_size = 8192");
  WriteTransaction transaction(connection);
  if (connection.integer("SELECT count(*) FROM sqlite_schema") == 0) {
    connection.execute(kTables);
    connection.execute(("PRAGMA application_id = " + std::to_string(kApplicationId)).c_str());
    connection.execute(("PRAGMA user_version = " + std::to_string(kVersion)).c_str());
  }
  transaction.commit();
}

}  // namespace

Connection openFile(const std::string& path, OpenMode mode) {
  const bool writes = mode == OpenMode::Write;
  const std::string nothing = path + ": there is no database: load logs into it first";
  if (look(path) == Found::Nothing) {
    if (!writes) throw EngineError(nothing);
    // An empty file is a new database to SQLite. The files beside it get its mode. When it cannot
    // be made, SQLite says why.
    constexpr mode_t kMode = 0640;
    const Descriptor made(open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, kMode));
  }
  Connection connection(path, mode);
  // A program that was killed while it made the tables left a file with a header; SQLite rolls such
  // a file back to an empty one when it opens it.
  std::int64_t version = connection.integer(kReadVersion);
  if (version == 0 && writes) {
    createTables(connection);
    version = connection.integer(kReadVersion);
  }
  if (version == 0) throw EngineError(nothing);
  checkVersion(path, version);
  if (writes) {
    // With a limit of its size, the log that stays is empty.
    connection.execute(
        "PRAGMA journal_mode = WAL; PRAGMA synchronous = FULL; PRAGMA journal_size_limit = "
        "67108864");
  }
  connection.execute("PRAGMA cache_size = -32768; PRAGMA mmap_size = 2147418112");
  return connection;
}

}  // namespace tavrel::fleet
