// A store unlike any that this program writes: rows of any type and order, runs that
// lead anywhere, damaged pages, damaged values kept beside it. Reading, adding, erasing
// and examining must end with the rows or with a reason. Runs and kept values must read
// back as they were written.
//
// Input: a byte that chooses between the store, runs and kept values, and what happens to the
// store: adding, erasing, and examining by SQLite; then their content.
#include <algorithm>
#include <limits>
#include <sqlite3.h>
#include <vector>

#include "memory_tree.h"
#include "platform/linux/files/digests.h"
#include "platform/linux/preferences/file_preferences.h"
#include "platform/linux/process/linux_clock.h"
#include "platform/linux/store/chunk_runs.h"
#include "platform/linux/store/kept_values.h"
#include "platform/linux/store/sqlite_store.h"
#include "platform/plist/coding.h"
#include "platform/store_path.h"
#include "sqlite_memory.h"
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

// Binds an integer, a real number, a text or a blob.
void bindValue(sqlite3_stmt* statement, int at, fuzz::Input& input) {
  const unsigned kind = input.byte();
  std::string bytes;
  switch (kind % 8) {
    case 0:
      sqlite3_bind_int64(statement, at, static_cast<std::int64_t>(input.word(8)));
      break;
    case 1:
      sqlite3_bind_double(statement, at, input.byte() + 0.5);
      break;
    case 2:
      bytes = std::to_string(input.byte());
      sqlite3_bind_text(statement, at, bytes.data(), static_cast<int>(bytes.size()),
                        SQLITE_TRANSIENT);
      break;
    case 3:
    case 4:
      bytes = input.upTo(kind / 8);
      sqlite3_bind_blob(statement, at, bytes.data(), static_cast<int>(bytes.size()),
                        SQLITE_TRANSIENT);
      break;
    default:
      sqlite3_bind_int64(statement, at, kind / 8);
  }
}

// A store in SQLite's memory with tables without STRICT, so that every column takes every type.
// Rows are added in a transaction that is rolled back: making tables for each input would take
// longer than reading them.
class RowMaker {
 public:
  explicit RowMaker(int version) {
    require(sqlite3_open(":memory:", &store_) == SQLITE_OK);
    std::string sql =
        "CREATE TABLE scalars (day, key, value, PRIMARY KEY (day, key)) WITHOUT ROWID;"
        "CREATE TABLE chunks (chunk INTEGER PRIMARY KEY, data);"
        "CREATE TABLE segments (owner, identity, position, PRIMARY KEY (owner, identity)) "
        "WITHOUT ROWID;"
        "CREATE TABLE distributions (day, key, count, ";
    sql += version == 1 ? "series" : "runs";
    sql += ", PRIMARY KEY (day, key)) WITHOUT ROWID; PRAGMA user_version = ";
    run((sql + std::to_string(version)).c_str());
    scalars_ = prepare("INSERT OR IGNORE INTO scalars VALUES (?1, ?2, ?3)");
    distributions_ = prepare("INSERT OR IGNORE INTO distributions VALUES (?1, ?2, ?3, ?4)");
    chunks_ = prepare("INSERT OR IGNORE INTO chunks VALUES (?1, ?2)");
  }

  /// The store's file with the rows that the input describes.
  std::string make(fuzz::Input& input) {
    run("BEGIN");
    for (int row = 0; row < 40 && !input.empty(); ++row) {
      const unsigned kind = input.byte() % 4;
      sqlite3_stmt* const statement = kind == 0 ? scalars_ : kind == 1 ? distributions_ : chunks_;
      int at = 1;
      if (kind > 1) sqlite3_bind_int64(statement, at++, input.byte() % 8);
      while (at <= sqlite3_bind_parameter_count(statement))
        bindValue(statement, at++, input);
      require(sqlite3_step(statement) == SQLITE_DONE);
      sqlite3_reset(statement);
    }
    sqlite3_int64 size = 0;
    unsigned char* const bytes = sqlite3_serialize(store_, "main", &size, 0);
    require(bytes != nullptr);
    std::string file(reinterpret_cast<const char*>(bytes), static_cast<std::size_t>(size));
    sqlite3_free(bytes);
    run("ROLLBACK");
    return file;
  }

 private:
  void run(const char* sql) {
    require(sqlite3_exec(store_, sql, nullptr, nullptr, nullptr) == SQLITE_OK);
  }
  sqlite3_stmt* prepare(const char* sql) {
    sqlite3_stmt* statement = nullptr;
    require(sqlite3_prepare_v2(store_, sql, -1, &statement, nullptr) == SQLITE_OK);
    return statement;
  }

  sqlite3* store_ = nullptr;
  sqlite3_stmt* scalars_ = nullptr;
  sqlite3_stmt* distributions_ = nullptr;
  sqlite3_stmt* chunks_ = nullptr;
};

void makeRows(Device& device, fuzz::Input& input) {
  static RowMaker first(1);
  static RowMaker second(2);
  device.write(kStorePath, (input.byte() % 4 == 0 ? first : second).make(input));
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

// Everything that SQLite allocates meanwhile must be freed: no sanitizer sees its leaks.
struct NothingHeld {
  ~NothingHeld() { require(fuzz::sqliteBlocks() == before); }
  const std::size_t before = fuzz::sqliteBlocks();
};

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

void add(Device& device) {
  if (auto batch = device.store.beginBatch()) {
    (*batch)->refuseUnwritableSeries();
    const bool isAdded = (*batch)->addScalar(1, "a", 1) && (*batch)->appendValue(1, "a", 1, 1.0) &&
                         (*batch)->commit();
    static_cast<void>(isAdded);
  }
}

struct Steps {
  explicit Steps(unsigned choice)
      : adds(choice / 32 % 2 != 0), erases(choice / 64 % 2 != 0), examines(choice / 4 % 8 == 1) {}
  bool adds, erases, examines;
};

// Each step opens the store, which takes longer than reading or writing a few rows. So the input
// chooses what happens before the store is read.
void useStore(Device& device, const Steps& steps) {
  const NothingHeld check;
  if (steps.adds) add(device);
  if (steps.erases) tell(device.store.erase({"a", 0, 2}));
  if (auto history = device.store.openHistory()) read(**history, steps.examines);
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
  const NothingHeld check;
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

extern "C" int LLVMFuzzerInitialize(int*, char***) {
  fuzz::setUpSqliteMemory();
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  fuzz::Input input(data, size);
  Device device;
  device.write(std::string(kStorePath) + "-other", "");  // makes the folder
  const unsigned choice = input.byte();
  switch (choice % 4) {
    case 0:
      makeRows(device, input);
      useStore(device, Steps(choice));
      break;
    case 1:
      damage(device, input);
      useStore(device, Steps(choice));
      break;
    case 2:
      readRuns(input.text());
      break;
    default:
      readKept(device, std::string(input.text()));
  }
  return 0;
}
