#include "platform/linux/store/sqlite_trim.h"

#include <algorithm>
#include <functional>
#include <set>
#include <string>
#include <sys/statvfs.h>
#include <time.h>
#include <utility>

#include "base/arithmetic.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/store/chunk_runs.h"
#include "platform/linux/store/sqlite_log_file.h"
#include "platform/linux/store/sqlite_schema.h"
#include "platform/linux/store/sqlite_segments.h"

namespace tavrel {
namespace {

// The work of one transaction, in scalar rows: some milliseconds. A chunk counts as several rows:
// its up to three pages are freed one by one.
constexpr std::int64_t kStepRows = 4096;
constexpr std::int64_t kRowsPerChunk = 8;

// Pages moved to holes at the front of the file in one transaction.
constexpr std::int64_t kStepPages = 256;

// Long enough for others, which try for the lock every five milliseconds.
constexpr timespec kPause{0, 10'000'000};

// A conversion copies the store through memory into its log, and other writers wait meanwhile:
// a second or two on slow flash.
constexpr std::int64_t kConvertibleBytes = 16 << 20;

// Times the store's size: the copy, the log, and writes of others meanwhile.
constexpr std::int64_t kConversionRoom = 3;

constexpr std::int64_t kNoVacuum = 0;

constexpr const char* kTablesByDay[] = {"scalars", "distributions"};

void addDaysIn(SqliteConnection& connection, const char* table, std::set<std::int32_t>& days) {
  // Damage, or another program, may leave days that exceed 32 bits, have fractions, or are no
  // numbers, which sort after all numbers.
  SqliteStatement next(connection, std::string("SELECT day FROM ") + table +
                                       " WHERE day BETWEEN ?1 AND 2147483647"
                                       " ORDER BY day LIMIT 1");
  for (std::int64_t wanted = INT32_MIN;;) {
    next.bind(1, wanted);
    if (!next.step()) break;
    const std::int64_t day = next.integer(0);
    days.insert(static_cast<std::int32_t>(day));
    wanted = day + 1;
    next.reset();
  }
}

}  // namespace

// A distribution, and its runs that remain to be removed.
struct SqliteTrim::Row {
  std::string key;
  std::int64_t count;
  std::vector<ChunkRun> runs;
};

std::vector<std::int32_t> daysIn(SqliteConnection& connection) {
  std::set<std::int32_t> days;
  for (const char* table : kTablesByDay)
    addDaysIn(connection, table, days);
  return {days.begin(), days.end()};
}

std::int64_t bytesInUseOf(SqliteConnection& connection) {
  const std::int64_t pages =
      connection.integer("PRAGMA page_count") - connection.integer("PRAGMA freelist_count");
  const bool hasSegments =
      connection.integer("SELECT count(*) FROM sqlite_schema WHERE name = 'segments'") > 0;
  return pages * connection.integer("PRAGMA page_size") -
         (hasSegments ? segment_table::positionBytes(connection) : 0);
}

template <class Operation>
std::invoke_result_t<Operation> SqliteTrim::attempt(Operation operation) {
  damage_.reset();
  try {
    return operation();
  } catch (const StoreFailure& failure) {
    return note(failure);
  }
}

Error SqliteTrim::note(const StoreFailure& failure) {
  if (failure.fault == StoreFault::Damaged) damage_ = {file_, failure};
  return Error{site_.describe(failure)};
}

Expected<std::vector<std::int32_t>> SqliteTrim::days() {
  return attempt([&]() -> Expected<std::vector<std::int32_t>> { return daysIn(connection_); });
}

std::vector<std::int32_t> SqliteTrim::readableDays() {
  std::set<std::int32_t> days;
  for (const char* table : kTablesByDay) {
    try {
      addDaysIn(connection_, table, days);
    } catch (const StoreFailure&) {
      // Most of its days are in the other table as well.
    }
  }
  return {days.begin(), days.end()};
}

Expected<std::int64_t> SqliteTrim::bytesInUse() {
  return attempt([&]() -> Expected<std::int64_t> { return bytesInUseOf(connection_); });
}

// Runs `step` repeatedly, each time in a transaction, until it returns false. On a full disk,
// empties the log, so that its space can be used again; when that does not help, makes the steps
// smaller.
Status SqliteTrim::inSteps(std::int64_t budget, const std::function<bool(std::int64_t)>& step) {
  bool hasAdvanced = false;  // since the log was emptied
  while (true) {
    try {
      connection_.execute("BEGIN IMMEDIATE");
      if (schemaVersion(connection_) == kFirstSchemaVersion) {
        migrate(connection_);
        continue;
      }
      const bool goesOn = step(budget);
      connection_.execute("COMMIT");
      hasAdvanced = true;
      limitLog(kKeptLogBytes);
      if (!goesOn) return Done{};
    } catch (const StoreFailure& failure) {
      try {
        connection_.execute("ROLLBACK");
      } catch (const StoreFailure&) {
        // SQLite has rolled back already.
      }
      const bool mayFit = failure.fault == StoreFault::Device && (hasAdvanced || budget > 1);
      if (!mayFit) return note(failure);
      if (!hasAdvanced) budget = std::max<std::int64_t>(budget / 16, 1);
      hasAdvanced = false;
      limitLog(0);
    }
    nanosleep(&kPause, nullptr);
  }
}

Status SqliteTrim::removeDay(std::int32_t day) {
  return attempt([&] {
    return inSteps(kStepRows, [&](std::int64_t budget) { return removeSome(day, budget); });
  });
}

// False when the day has gone.
bool SqliteTrim::removeSome(std::int32_t day, std::int64_t budget) {
  const std::int64_t left = budget - removeScalars(day, budget);
  return left <= 0 || removeDistributions(day, left) <= 0;
}

// Returns how many it removed, at most `budget`.
std::int64_t SqliteTrim::removeScalars(std::int32_t day, std::int64_t budget) {
  // Finds the key of the last row within the budget; none when fewer rows are left.
  SqliteStatement last(connection_,
                       "SELECT key FROM scalars WHERE day = ?1 ORDER BY key LIMIT 1 OFFSET ?2");
  last.bind(1, day);
  last.bind(2, budget - 1);
  if (last.step()) {
    const std::string key(last.bytes(0));
    last.reset();
    SqliteStatement remove(connection_, "DELETE FROM scalars WHERE day = ?1 AND key <= ?2");
    remove.bind(1, day);
    remove.bind(2, std::string_view(key));
    remove.runOnFound();
    return budget;
  }
  last.reset();
  SqliteStatement remove(connection_, "DELETE FROM scalars WHERE day = ?1");
  remove.bind(1, day);
  remove.run();
  return connection_.integer("SELECT changes()");
}

// Returns the rest of the budget: 0 or less when the day may have more.
std::int64_t SqliteTrim::removeDistributions(std::int32_t day, std::int64_t budget) {
  std::vector<Row> rows;
  {
    SqliteStatement next(connection_,
                         "SELECT key, count, runs FROM distributions WHERE day = ?1 ORDER BY key");
    next.bind(1, day);
    for (std::int64_t work = 0; work < budget && next.step(); ++work) {
      rows.push_back({std::string(next.bytes(0)), next.integer(1), {}});
      Row& row = rows.back();
      auto runs = unpackRuns(next.bytes(2));
      // The chunks that a damaged row refers to may belong to another row.
      if (runs && valuesIn(*runs) == row.count) row.runs = *std::move(runs);
      for (const ChunkRun& run : row.runs)
        work += kRowsPerChunk * (run.end() - run.first);
    }
  }
  for (Row& row : rows) {
    if (budget <= 0 || !removeRow(day, row, budget)) return 0;
  }
  return budget;
}

// Removes as many runs as the budget allows, at least one, and with the last run the row. False
// when some of it is left.
bool SqliteTrim::removeRow(std::int32_t day, Row& row, std::int64_t& budget) {
  SqliteStatement removeChunks(connection_, "DELETE FROM chunks WHERE chunk >= ?1 AND chunk < ?2");
  while (!row.runs.empty() && budget > 0) {
    const ChunkRun& run = row.runs.back();
    removeChunks.bind(1, run.first);
    removeChunks.bind(2, run.end());
    removeChunks.run();
    budget -= kRowsPerChunk * (run.end() - run.first);
    row.count -= run.values;
    row.runs.pop_back();
  }
  if (row.runs.empty()) {
    SqliteStatement remove(connection_, "DELETE FROM distributions WHERE day = ?1 AND key = ?2");
    remove.bind(1, day);
    remove.bind(2, std::string_view(row.key));
    remove.runOnFound();
    --budget;
    return true;
  }
  std::string packed;
  for (const ChunkRun& run : row.runs)
    appendRun(packed, run);
  SqliteStatement shorten(
      connection_, "UPDATE distributions SET count = ?3, runs = ?4 WHERE day = ?1 AND key = ?2");
  shorten.bind(1, day);
  shorten.bind(2, std::string_view(row.key));
  shorten.bind(3, row.count);
  shorten.bind(4, std::string_view(packed));
  shorten.runOnFound();
  return false;
}

bool SqliteTrim::canBeConverted(std::int64_t bytes) {
  struct statvfs room {};
  if (bytes > kConvertibleBytes || statvfs(site_.path.c_str(), &room) != 0) return false;
  const auto available = checkedMultiply(room.f_bavail, room.f_frsize);
  return !available || *available >= static_cast<std::uint64_t>(kConversionRoom * bytes);
}

Status SqliteTrim::giveBack(std::int64_t freeBytesKept) {
  return attempt([&]() -> Status {
    const std::int64_t pageBytes = connection_.integer("PRAGMA page_size");
    const auto surplus = [&] {
      return connection_.integer("PRAGMA freelist_count") - freeBytesKept / pageBytes;
    };
    if (surplus() <= 0) return Done{};
    if (connection_.integer("PRAGMA auto_vacuum") == kNoVacuum) {
      if (!canBeConverted(bytesInUseOf(connection_))) return Done{};
      connection_.execute("PRAGMA temp_store = MEMORY; PRAGMA auto_vacuum = INCREMENTAL; VACUUM");
      connection_.checkpoint(false);
      return Done{};
    }
    const Status done = inSteps(kStepPages, [&](std::int64_t budget) {
      const std::int64_t pages = std::min(surplus(), budget);
      if (pages <= 0) return false;
      connection_.execute(("PRAGMA incremental_vacuum(" + std::to_string(pages) + ")").c_str());
      return pages == budget;
    });
    if (!done) return done;
    // The file itself is shortened only when the log is moved into it.
    connection_.checkpoint(false);
    return Done{};
  });
}

// If readers prevent it, the next step or the daily run moves the log.
void SqliteTrim::limitLog(off_t bytes) {
  const auto log = FileSystem::status(site_.path + "-wal");
  if (!log || log->st_size <= bytes) return;
  try {
    connection_.checkpoint(false);
  } catch (const StoreFailure&) {
  }
}

}  // namespace tavrel
