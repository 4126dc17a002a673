// A store unlike any that this program writes: rows of any type and order, runs that
// lead anywhere, damaged pages, damaged values kept beside it. Reading, adding, erasing
// and examining must end with the rows or with a reason. Runs and kept values must read
// back as they were written.
//
// Input: a byte that chooses between the store, runs and kept values, and whether SQLite examines
// the store; then their content.
#include <algorithm>
#include <limits>
#include <vector>

#include "base/text.h"
#include "memory_tree.h"
#include "platform/linux/files/digests.h"
#include "platform/linux/preferences/file_preferences.h"
#include "platform/linux/process/linux_clock.h"
#include "platform/linux/store/chunk_runs.h"
#include "platform/linux/store/kept_values.h"
#include "platform/linux/store/sqlite_store.h"
#include "platform/plist/coding.h"
#include "platform/store_path.h"
#include "support.h"

using namespace tavrel;
using fuzz::require;

namespace {

constexpr std::int32_t kFirstDay = std::numeric_limits<std::int32_t>::min();
constexpr std::int32_t kLastDay = std::numeric_limits<std::int32_t>::max();

struct Device : fuzz::Tree {
  fuzz::SilentLog log;
  FileSystem files;
  LinuxClock clock;
  plist::PlistCoding coding;
  FilePreferences preferences{root, files, coding, clock, log};
  SqliteStore store{root, clock, preferences, log, 0};
};

// An SQL literal: an integer, a real number, a text or a blob.
std::string literal(fuzz::Input& input) {
  switch (const unsigned kind = input.byte(); kind % 8) {
    case 0:
      return std::to_string(static_cast<std::int64_t>(input.word(8)));
    case 1:
      return std::to_string(input.byte()) + ".5";
    case 2:
      return "'" + std::to_string(input.byte()) + "'";
    case 3:
    case 4: {
      std::string blob = "x'";
      appendHex(blob, asBytes(input.upTo(kind / 8)));
      return blob + "'";
    }
    default:
      return std::to_string(kind / 8);
  }
}

// Makes tables without STRICT, so that every column takes every type.
void makeRows(const std::string& path, fuzz::Input& input) {
  const bool isFirstVersion = input.byte() % 4 == 0;
  SqliteConnection made(path, SqliteConnection::Access::Create, std::make_shared<BusyBudget>(0));
  made.execute("PRAGMA journal_mode = OFF; PRAGMA synchronous = OFF; BEGIN");
  std::string sql =
      "CREATE TABLE scalars (day, key, value, PRIMARY KEY (day, key)) WITHOUT ROWID;"
      "CREATE TABLE chunks (chunk INTEGER PRIMARY KEY, data);"
      "CREATE TABLE segments (owner, identity, position, PRIMARY KEY (owner, identity)) "
      "WITHOUT ROWID;"
      "CREATE TABLE distributions (day, key, count, ";
  sql += isFirstVersion ? "series" : "runs";
  sql += ", PRIMARY KEY (day, key)) WITHOUT ROWID; PRAGMA user_version = ";
  made.execute((sql + (isFirstVersion ? "1" : "2")).c_str());
  for (int row = 0; row < 40 && !input.empty(); ++row) {
    const unsigned kind = input.byte();
    sql = kind % 4 == 0   ? "INSERT OR IGNORE INTO scalars VALUES ("
          : kind % 4 == 1 ? "INSERT OR IGNORE INTO distributions VALUES ("
                          : "INSERT OR IGNORE INTO chunks VALUES (";
    if (kind % 4 > 1) {
      sql += std::to_string(input.byte() % 8) + ',' + literal(input);
    } else {
      sql += literal(input) + ',' + literal(input) + ',' + literal(input);
      if (kind % 4 == 1) sql += ',' + literal(input);
    }
    made.execute((sql + ")").c_str());
  }
  made.execute("COMMIT");
}

// Makes a sound store and changes some of its bytes.
void damage(Device& device, fuzz::Input& input) {
  static const std::string sound = [] {
    Device other;
    const auto batch = other.store.beginBatch();
    require(static_cast<bool>(batch));
    for (int day = 0; day < 3; ++day) {
      for (const std::string key : {"a", "ab", "b"}) {
        require(static_cast<bool>((*batch)->setScalar(day, key, day)));
        for (std::uint32_t i = 0; i < 30; ++i)
          require(static_cast<bool>((*batch)->appendValue(day, key, i, i)));
      }
    }
    require(static_cast<bool>((*batch)->commit()) && other.store.BHClientCheckpoint());
    return *other.files.read(other.store.path(), 1 << 20);
  }();
  std::string bytes = sound;
  for (int edit = 0; edit < 64 && !input.empty(); ++edit) {
    const std::size_t at = input.word(2) % bytes.size();
    bytes[at] = static_cast<char>(input.byte());
  }
  device.write(kStorePath, bytes);
}

// Every failure must have a reason.
void tell(const auto& outcome) {
  require(outcome || !outcome.error().message.empty());
}

void read(SqliteHistory& history, bool isExamined) {
  const BHHistory::ScalarRowHandler takeScalar = [](std::string_view, std::int32_t, std::int64_t,
                                                    bool&) {};
  // Reads once the values alone, and once with their offsets.
  const SqliteHistory::CountedRowHandler takeValues =
      [&](std::string_view, std::int32_t day, std::int64_t count,
          BHHistoryDistributionEnumerator& values, bool&) {
        std::int64_t got = 0;
        if (day % 2 == 0) {
          for (auto block = values.nextValues(); !block.empty(); block = values.nextValues())
            got += static_cast<std::int64_t>(block.size() / kPackedValueBytes);
        } else {
          double value = 0;
          std::uint32_t offset = 0;
          while (values.getNextValue(value, offset))
            ++got;
        }
        require(values.failed() || got == count);
      };
  tell(history.walkScalars("", kFirstDay, kLastDay, takeScalar));
  tell(history.walkScalar("a", kFirstDay, kLastDay, takeScalar));
  tell(history.walkDistributions("", kFirstDay, kLastDay, takeValues));
  tell(history.walkDistribution("a", kFirstDay, kLastDay, takeValues));
  tell(history.daysHeld());
  tell(history.bytesInUse());
  // A thread limits the duration, which takes longer than everything else.
  if (isExamined) tell(history.examine(std::chrono::seconds(5)));
  const auto days = history.days();
  tell(days);
  if (days) require(std::ranges::is_sorted(*days));
}

void useStore(Device& device, bool isExamined) {
  if (auto history = device.store.openHistory()) read(**history, isExamined);
  if (auto batch = device.store.beginBatch()) {
    (*batch)->refuseUnwritableSeries();
    const bool isAdded = (*batch)->addScalar(1, "a", 1) && (*batch)->appendValue(1, "a", 1, 1.0) &&
                         (*batch)->commit();
    static_cast<void>(isAdded);
  }
  tell(device.store.erase({"a", 0, 2}));
  if (auto history = device.store.openHistory()) read(**history, false);
}

void readRuns(std::string_view packed) {
  const auto runs = unpackRuns(packed);
  if (!runs) return;
  std::string again;
  for (const ChunkRun& run : *runs) {
    require(run.first >= 0 && run.chunks >= 0 && run.values >= 0 && run.end() >= run.first);
    appendRun(again, run);
  }
  require(unpackRuns(again) == runs && firstToJoin(*runs) <= runs->size());
  if (const auto sum = valuesIn(*runs)) require(*sum >= 0 && *sum <= kValuesPerDistribution);
}

void readKept(Device& device, std::string content) {
  content += asText(sha256(asBytes(content)));
  device.write(std::string(kStorePath) + "-kept", content);
  KeptValues kept(device.store.path());
  const auto before = kept.read();
  require(static_cast<bool>(before));
  if (!*before) return require(!kept.setAsideIfDamaged().empty() && !kept.exist());
  const auto dropped = kept.add({{0, 7, -1, "added"}});
  require(dropped && *dropped == 0);
  const auto after = kept.read();
  require(after && *after && (*after)->size() == (*before)->size() + 1);
  require((*after)->back().key == "added" && (*after)->back().value == -1);
  require(device.store.commit());
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  fuzz::Input input(data, size);
  Device device;
  device.write(std::string(kStorePath) + "-other", "");  // makes the folder
  const unsigned choice = input.byte();
  switch (choice % 4) {
    case 0:
      makeRows(device.store.path(), input);
      useStore(device, choice / 4 % 8 == 1);
      break;
    case 1:
      damage(device, input);
      useStore(device, choice / 4 % 8 == 1);
      break;
    case 2:
      readRuns(input.text());
      break;
    default:
      readKept(device, std::string(input.text()));
  }
  return 0;
}
