// The statistics store: reading a day's rows and values through the history, next to SQLite itself
// reading the same day from one row each, and writing a batch.
#include <benchmark/benchmark.h>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <sqlite3.h>
#include <stdlib.h>
#include <string>
#include <vector>

#include "platform/linux/linux_platform.h"
#include "platform/linux/store/sqlite_store.h"

namespace {

using namespace tavrel;

constexpr std::int32_t kDay = 20781;

std::string keyNumber(std::int64_t number) {
  std::string digits = std::to_string(number);
  return "com.example.statistic." + std::string(7 - digits.size(), '0') + digits;
}

class Device {
 public:
  Device() : folder_(makeFolder()), linux_(DeviceRoot(folder_)) {}
  ~Device() { std::filesystem::remove_all(folder_); }
  Device(const Device&) = delete;
  Device& operator=(const Device&) = delete;

  SqliteStore& store() { return linux_.store(); }

  void fill(std::int64_t scalars, std::int64_t values) {
    auto batch = store().beginBatch();
    if (!batch) abort();
    bool done = true;
    for (std::int64_t i = 0; i < scalars; ++i) {
      done = done && (*batch)->setScalar(kDay, keyNumber(i), i);
    }
    for (std::int64_t i = 0; i < values; ++i) {
      done = done && (*batch)->appendValue(kDay, "d", 0, static_cast<double>(i));
    }
    if (!done || !(*batch)->commit()) abort();
  }

  /// A plain table of the same rows, in a separate file.
  sqlite3* plainTable(std::int64_t rows) {
    sqlite3* handle = nullptr;
    sqlite3_open((folder_ + "/plain").c_str(), &handle);
    const std::string sql =
        "CREATE TABLE plain (day, key, value, PRIMARY KEY (day, key)) WITHOUT ROWID;"
        "WITH RECURSIVE n (i) AS (SELECT 0 UNION ALL SELECT i + 1 FROM n WHERE i < " +
        std::to_string(rows - 1) +
        ") INSERT INTO plain SELECT 20781, printf('com.example.statistic.%07d', i), i FROM n";
    if (sqlite3_exec(handle, sql.c_str(), nullptr, nullptr, nullptr) != SQLITE_OK) abort();
    return handle;
  }

 private:
  static std::string makeFolder() {
    std::string name = (std::filesystem::temp_directory_path() / "tavrel-bench-XXXXXX").string();
    if (!mkdtemp(name.data())) abort();
    return name;
  }

  std::string folder_;
  LinuxPlatform linux_;
};

void scalarsOfDay(benchmark::State& state) {
  Device device;
  device.fill(state.range(0), 1'000'000);
  for (auto _ : state) {
    std::int64_t sum = 0;
    device.store().initWithDefaultPath()->scalarsForKeyPrefix(
        "", kDay - 1, kDay,
        [&](std::string_view, std::int32_t, std::int64_t value, bool&) { sum += value; });
    benchmark::DoNotOptimize(sum);
  }
  state.SetItemsProcessed(state.iterations() * state.range(0));
}
BENCHMARK(scalarsOfDay)->RangeMultiplier(10)->Range(1000, 100'000);

void scalarsOfDayBySqlite(benchmark::State& state) {
  Device device;
  sqlite3* const handle = device.plainTable(state.range(0));
  for (auto _ : state) {
    sqlite3_stmt* statement = nullptr;
    sqlite3_prepare_v2(handle, "SELECT key, value FROM plain WHERE day = 20781 ORDER BY key", -1,
                       &statement, nullptr);
    std::int64_t sum = 0;
    while (sqlite3_step(statement) == SQLITE_ROW) {
      benchmark::DoNotOptimize(sqlite3_column_text(statement, 0));
      sum += sqlite3_column_int64(statement, 1);
    }
    sqlite3_finalize(statement);
    benchmark::DoNotOptimize(sum);
  }
  sqlite3_close(handle);
  state.SetItemsProcessed(state.iterations() * state.range(0));
}
BENCHMARK(scalarsOfDayBySqlite)->RangeMultiplier(10)->Range(1000, 100'000);

void valuesOfDay(benchmark::State& state) {
  Device device;
  device.fill(0, state.range(0));
  for (auto _ : state) {
    double sum = 0;
    device.store().initWithDefaultPath()->distributionsForKeyPrefix(
        "", kDay - 1, kDay,
        [&](std::string_view, std::int32_t, BHHistoryDistributionEnumerator& values, bool&) {
          double value = 0;
          std::uint32_t seconds = 0;
          while (values.getNextValue(value, seconds))
            sum += value;
        });
    benchmark::DoNotOptimize(sum);
  }
  state.SetItemsProcessed(state.iterations() * state.range(0));
}
BENCHMARK(valuesOfDay)->RangeMultiplier(10)->Range(1000, 1'000'000);

void setScalars(benchmark::State& state) {
  for (auto _ : state) {
    Device device;
    device.fill(state.range(0), 0);
  }
  state.SetItemsProcessed(state.iterations() * state.range(0));
}
BENCHMARK(setScalars)->RangeMultiplier(10)->Range(1000, 100'000)->Unit(benchmark::kMillisecond);

void appendValues(benchmark::State& state) {
  for (auto _ : state) {
    Device device;
    device.fill(0, state.range(0));
  }
  state.SetItemsProcessed(state.iterations() * state.range(0));
}
BENCHMARK(appendValues)->RangeMultiplier(10)->Range(1000, 1'000'000)->Unit(benchmark::kMillisecond);

/// A fold: many records for each of many keys, in one transaction.
constexpr std::int64_t kFoldKeys = 1000;
constexpr std::int64_t kFoldRecords = 1000;  // per key

void fold(benchmark::State& state) {
  std::vector<DistributionSample> samples;
  for (std::uint32_t i = 0; i < kFoldRecords; ++i)
    samples.push_back({i * 0.1, i * 86});
  for (auto _ : state) {
    state.PauseTiming();
    auto device = std::make_unique<Device>();
    device->fill(1, 1);
    state.ResumeTiming();
    auto batch = device->store().beginBatch();
    bool done = static_cast<bool>(batch);
    for (std::int64_t key = 0; key < kFoldKeys; ++key)
      done = done && (*batch)->appendValues(kDay, keyNumber(key), samples);
    if (!done || !(*batch)->commit()) abort();
    batch->reset();
    state.PauseTiming();
    device.reset();
    state.ResumeTiming();
  }
  state.SetItemsProcessed(state.iterations() * kFoldKeys * kFoldRecords);
}
BENCHMARK(fold)->Unit(benchmark::kMillisecond);

/// SQLite alone with the same chunks, already packed.
void foldBySqlite(benchmark::State& state) {
  const std::string values(kFoldRecords * 8, 'v');
  const std::string offsets(kFoldRecords * 4, 'o');
  for (auto _ : state) {
    state.PauseTiming();
    auto device = std::make_unique<Device>();
    sqlite3* const handle = device->plainTable(1);
    sqlite3_exec(handle,
                 "PRAGMA journal_mode = WAL; PRAGMA synchronous = FULL; PRAGMA cache_size = -8192;"
                 "PRAGMA wal_autocheckpoint = 0; CREATE TABLE chunks (chunk INTEGER PRIMARY KEY, "
                 "data BLOB NOT NULL)",
                 nullptr, nullptr, nullptr);
    state.ResumeTiming();
    sqlite3_exec(handle, "BEGIN IMMEDIATE", nullptr, nullptr, nullptr);
    sqlite3_stmt* statement = nullptr;
    sqlite3_prepare_v2(handle, "INSERT INTO chunks (data) VALUES (?1)", -1, &statement, nullptr);
    for (std::int64_t key = 0; key < kFoldKeys; ++key) {
      for (const std::string* data : {&values, &offsets}) {
        sqlite3_bind_blob64(statement, 1, data->data(), data->size(), SQLITE_STATIC);
        if (sqlite3_step(statement) != SQLITE_DONE) abort();
        sqlite3_reset(statement);
      }
    }
    sqlite3_finalize(statement);
    sqlite3_exec(handle, "COMMIT; PRAGMA wal_checkpoint(TRUNCATE)", nullptr, nullptr, nullptr);
    state.PauseTiming();
    sqlite3_close(handle);
    device.reset();
    state.ResumeTiming();
  }
  state.SetItemsProcessed(state.iterations() * kFoldKeys * kFoldRecords);
}
BENCHMARK(foldBySqlite)->Unit(benchmark::kMillisecond);

}  // namespace
