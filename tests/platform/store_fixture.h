#pragma once

#include <functional>
#include <limits>
#include <sqlite3.h>

#include "platform/linux/store/sqlite_store.h"
#include "tests/devices/device_services.h"

namespace tavrel {

constexpr std::int32_t kFirstDay = std::numeric_limits<std::int32_t>::min();
constexpr std::int32_t kLastDay = std::numeric_limits<std::int32_t>::max();
constexpr std::int64_t kSmallest = std::numeric_limits<std::int64_t>::min();
constexpr std::int64_t kLargest = std::numeric_limits<std::int64_t>::max();
constexpr std::int32_t kToday = 20784;

struct Row {
  std::string key;
  std::int32_t day;
  std::int64_t value;
  bool operator==(const Row&) const = default;
};
inline void PrintTo(const Row& row, std::ostream* out) {
  *out << '"' << row.key.substr(0, 20) << "\"/" << row.day << '=' << row.value;
}
using Rows = std::vector<Row>;

using Sample = BHHistoryDistributionEnumerator::Sample;

/// During its lifetime, reads of SQLite fail for which `fails` returns true.
class FailingReads {
 public:
  using Test = std::function<bool(off_t offset, std::size_t size)>;
  explicit FailingReads(Test fails) {
    fails_ = std::move(fails);
    replaceReads(read);
  }
  /// Those of bytes from `first` on, before `end`.
  FailingReads(off_t first, off_t end)
      : FailingReads([first, end](off_t from, std::size_t size) {
          return from < end && first < from + static_cast<off_t>(size);
        }) {}
  ~FailingReads() { replaceReads(nullptr); }

 private:
  static ssize_t read(int file, void* into, std::size_t size, off_t offset) {
    if (!fails_(offset, size)) return pread(file, into, size, offset);
    errno = EIO;  // statements turn it into SQLITE_CORRUPT
    return -1;
  }
  // With null, those of the system.
  static void replaceReads(decltype(&read) call) {
    sqlite3_vfs* const system = sqlite3_vfs_find(nullptr);
    for (const char* name : {"pread", "pread64"})
      system->xSetSystemCall(system, name, reinterpret_cast<sqlite3_syscall_ptr>(call));
  }

  static inline Test fails_;
};

class StoreTest : public testing::Test, protected DeviceServices {
 protected:
  std::unique_ptr<SqliteStore> open(int busyMilliseconds = 10'000) {
    return std::make_unique<SqliteStore>(root, clock, preferences, log, busyMilliseconds);
  }

  static Rows scalars(BHHistory& history, std::string_view prefix, std::int64_t min,
                      std::int64_t max) {
    Rows rows;
    history.scalarsForKeyPrefix(prefix, min, max, [&](auto key, auto day, auto value, auto&) {
      rows.push_back({std::string(key), day, value});
    });
    return rows;
  }
  Rows scalarsOfToday() { return scalars(*store_->initWithDefaultPath(), "", kToday - 1, kToday); }

  static std::vector<Sample> take(BHHistoryDistributionEnumerator& values) {
    std::vector<Sample> samples;
    for (Sample sample; values.getNextValue(sample.value, sample.secondsInDayOffset);)
      samples.push_back(sample);
    return samples;
  }

  void set(const Rows& rows) {
    auto batch = store_->beginBatch();
    ASSERT_TRUE(batch) << batch.error().message;
    for (const Row& row : rows)
      ASSERT_TRUE((*batch)->setScalar(row.day, row.key, row.value));
    ASSERT_TRUE((*batch)->commit());
  }

  /// Runs SQL on the file as another program would; returns the first column of all rows.
  Lines sql(const std::string& text) {
    sqlite3* handle = nullptr;
    EXPECT_EQ(sqlite3_open(store_->path().c_str(), &handle), SQLITE_OK);
    Lines column;
    const auto add = [](void* out, int count, char** values, char**) {
      static_cast<Lines*>(out)->emplace_back(values[count - 1]);
      return 0;
    };
    EXPECT_EQ(sqlite3_exec(handle, text.c_str(), add, &column, nullptr), SQLITE_OK) << text;
    sqlite3_close(handle);
    return column;
  }

  /// Moves the log into the file and removes it, as another program's last connection does.
  void settle() { sql("PRAGMA wal_checkpoint"); }

  Lines setAsideFiles() {
    Lines found;
    for (const auto& entry :
         std::filesystem::directory_iterator(std::filesystem::path(store_->path()).parent_path())) {
      const std::string name = entry.path();
      if (name.find(".corrupt-") != name.npos && !name.ends_with("-wal") && !name.ends_with("-shm"))
        found.push_back(name);
    }
    return found;
  }

  std::string where() const { return "statistics store " + store_->path() + ": "; }

  std::int64_t corruptions() {
    return preferences.ZTXPreferencesGetIntegerValue("DatabaseCorruptionCount",
                                                     "com.norvane.tallied");
  }

  std::unique_ptr<SqliteStore> store_ = open();
};

}  // namespace tavrel
