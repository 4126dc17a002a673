// Fills and reads a fleet's database, and prints how long that took.
//
//   tavrel_fleet_rows append DATABASE LOGS [AT_ONCE [SCALARS DISTRIBUTIONS]]
//                                                  files logs, of 300 rows by default
//   tavrel_fleet_rows floor FILE LOGS [AT_ONCE]    inserts as many rows with plain SQLite
//   tavrel_fleet_rows scan DATABASE [READERS]      reads all scalars and distributions
//   tavrel_fleet_rows merge DATABASE TIMES         merges the logs of the first distribution
//   tavrel_fleet_rows sum ADDRESS TIMES            lets ClickHouse add up their means
//   tavrel_fleet_rows own ADDRESS TIMES            lets ClickHouse merge their five numbers
//
// Prints: the operation, logs or rows, seconds of wall time, seconds of CPU time.
#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <limits>
#include <sqlite3.h>
#include <string>
#include <thread>
#include <vector>

#include "fleet/engine/clickhouse/server.h"
#include "fleet/engine/open/open_engine.h"
#include "fleet/questions/merged_numbers.h"

using namespace tavrel::fleet;

namespace {

constexpr std::size_t kScalars = 220;
constexpr std::size_t kDistributions = 30;
constexpr std::size_t kBuckets = 5;  // for every third distribution

class Watch {
 public:
  void start() {
    begin_ = std::chrono::steady_clock::now();
    processorsBegin_ = processors();
  }
  void stop() {
    seconds_ += std::chrono::duration<double>(std::chrono::steady_clock::now() - begin_).count();
    processorSeconds_ += processors() - processorsBegin_;
  }
  void print(const char* what, std::size_t count) const {
    std::printf("%s %zu %.3f %.3f\n", what, count, seconds_, processorSeconds_);
  }

 private:
  static double processors() {
    timespec time{};
    clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &time);
    return static_cast<double>(time.tv_sec) + 1e-9 * static_cast<double>(time.tv_nsec);
  }
  std::chrono::steady_clock::time_point begin_;
  double processorsBegin_ = 0;
  double seconds_ = 0;
  double processorSeconds_ = 0;
};

// Logs whose numbers look random but are always the same.
class Logs {
 public:
  explicit Logs(std::size_t scalars = kScalars, std::size_t distributions = kDistributions) {
    for (std::size_t i = 0; i < scalars; ++i)
      scalars_.push_back("com.example.component.counter_of_something." + std::to_string(i));
    for (std::size_t i = 0; i < distributions; ++i)
      distributions_.push_back("com.example.component.series_of_something." + std::to_string(i));
    for (std::size_t i = 0; i < kBuckets; ++i)
      labels_.push_back("(" + std::to_string(i * 10) + ", " + std::to_string(i * 10 + 10) + "]");
    std::sort(scalars_.begin(), scalars_.end());
    std::sort(distributions_.begin(), distributions_.end());
  }

  LogRecord make(std::uint64_t number) {
    LogRecord record;
    const std::uint64_t noise = draw();
    std::memcpy(record.digest.data(), &number, sizeof number);
    std::memcpy(record.digest.data() + 8, &noise, sizeof noise);
    record.day = 20'000 + static_cast<std::int32_t>(number % 30);
    record.osVersion = number % 2 == 0 ? "Pellio 4.2 (16R349)" : "Pellio 4.3 (16T12)";
    record.previousOsVersion = record.osVersion;
    record.whitelistDigest = "eb42570d2e2f7addc42403d203dafde4";
    record.taskID = "(no tasking id)";
    record.language = record.preferredLanguage = "de-AT";
    record.region = "AT";
    for (const std::string& key : scalars_)
      record.scalars.push_back({key, static_cast<std::int64_t>(draw() % 100'000)});
    for (std::size_t i = 0; i < distributions_.size(); ++i) {
      const double mean = static_cast<double>(draw() % 1'000'000) / 1024;
      record.distributions.push_back({distributions_[i], {0, mean * 3, mean, mean * 7, 24}});
      for (std::size_t bucket = 0; i % 3 == 0 && bucket < kBuckets; ++bucket) {
        const double lower = static_cast<double>(bucket) * 10;
        record.cells.push_back(
            {distributions_[i], lower, lower + 10, labels_[bucket], draw() % 24 + 1});
      }
    }
    return record;
  }

 private:
  std::uint64_t draw() {
    state_ ^= state_ << 13;
    state_ ^= state_ >> 7;
    state_ ^= state_ << 17;
    return state_ >> 11;
  }

  std::vector<std::string> scalars_;
  std::vector<std::string> distributions_;
  std::vector<std::string> labels_;
  std::uint64_t state_ = 88172645463325252;
};

void append(const char* where, std::size_t count, std::size_t atOnce, Logs logs) {
  Watch watch;
  const auto engine = openEngine(where, OpenMode::Write);
  std::size_t added = 0;
  for (std::size_t first = 0; first < count; first += atOnce) {
    std::vector<LogRecord> records;
    for (std::size_t i = first; i < std::min(first + atOnce, count); ++i)
      records.push_back(logs.make(i));
    watch.start();
    added += engine->append(records).added;
    watch.stop();
  }
  watch.print("append", added);
}

// Inserts the same rows in ascending order, with a statement that is bound and run for each.
void insertRows(const char* path, std::size_t count, std::size_t atOnce) {
  Watch watch;
  sqlite3* connection = nullptr;
  sqlite3_open(path, &connection);
  sqlite3_exec(connection,
               "PRAGMA page_size = 8192; PRAGMA journal_mode = WAL; PRAGMA synchronous = FULL; "
               "PRAGMA cache_size = -32768;"
               "CREATE TABLE scalar(id INTEGER PRIMARY KEY, value INTEGER);"
               "CREATE TABLE distribution(id INTEGER PRIMARY KEY, a, b, c, d, count INTEGER);"
               "CREATE TABLE cell(id INTEGER PRIMARY KEY, count INTEGER)",
               nullptr, nullptr, nullptr);
  sqlite3_stmt* scalar = nullptr;
  sqlite3_stmt* distribution = nullptr;
  sqlite3_stmt* cell = nullptr;
  sqlite3_prepare_v2(connection, "INSERT INTO scalar VALUES(?1, ?2)", -1, &scalar, nullptr);
  sqlite3_prepare_v2(connection, "INSERT INTO distribution VALUES(?1, ?2, ?3, ?4, ?5, ?6)", -1,
                     &distribution, nullptr);
  sqlite3_prepare_v2(connection, "INSERT INTO cell VALUES(?1, ?2)", -1, &cell, nullptr);
  const auto run = [](sqlite3_stmt* statement) {
    sqlite3_step(statement);
    sqlite3_reset(statement);
  };
  Logs logs;
  sqlite3_int64 id = sqlite3_int64{1} << 39;
  for (std::size_t first = 0; first < count; first += atOnce) {
    std::vector<LogRecord> records;
    for (std::size_t i = first; i < std::min(first + atOnce, count); ++i)
      records.push_back(logs.make(i));
    watch.start();
    sqlite3_exec(connection, "BEGIN IMMEDIATE", nullptr, nullptr, nullptr);
    for (const LogRecord& record : records) {
      for (const ScalarRow& row : record.scalars) {
        sqlite3_bind_int64(scalar, 1, ++id);
        sqlite3_bind_int64(scalar, 2, row.value);
        run(scalar);
      }
      for (const auto& [key, five] : record.distributions) {
        sqlite3_bind_int64(distribution, 1, ++id);
        sqlite3_bind_double(distribution, 2, five.minimum);
        sqlite3_bind_double(distribution, 3, five.maximum);
        sqlite3_bind_double(distribution, 4, five.mean);
        sqlite3_bind_double(distribution, 5, five.squaredDeviations);
        sqlite3_bind_int64(distribution, 6, static_cast<sqlite3_int64>(five.count));
        run(distribution);
      }
      for (const CellRow& row : record.cells) {
        sqlite3_bind_int64(cell, 1, ++id);
        sqlite3_bind_int64(cell, 2, static_cast<sqlite3_int64>(row.count));
        run(cell);
      }
    }
    sqlite3_exec(connection, "COMMIT", nullptr, nullptr, nullptr);
    watch.stop();
  }
  watch.print("floor", count);
  for (sqlite3_stmt* statement : {scalar, distribution, cell})
    sqlite3_finalize(statement);
  sqlite3_close(connection);
}

void scan(const char* where, std::size_t readers) {
  Watch watch;
  watch.start();
  const auto engine = openEngine(where, OpenMode::Read);
  const std::vector<Key> keys = engine->keys();
  std::atomic<std::size_t> next = 0;
  std::atomic<std::size_t> rows = 0;
  std::atomic<std::int64_t> sum = 0;
  {
    std::vector<std::jthread> threads;
    for (std::size_t reader = 0; reader < readers; ++reader) {
      threads.emplace_back([&] {
        const auto own = engine->reader();
        std::size_t ownRows = 0;
        std::int64_t ownSum = 0;
        for (std::size_t i = next++; i < keys.size(); i = next++) {
          if (keys[i].kind == KeyKind::Scalar) {
            own->scalars(keys[i].name, [&](std::span<const ScalarValue> values) {
              ownRows += values.size();
              for (const ScalarValue& value : values)
                ownSum += value.value;
            });
          }
          if (keys[i].kind == KeyKind::Distribution) {
            own->distributions(keys[i].name, [&](std::span<const DistributionValue> values) {
              ownRows += values.size();
            });
          }
        }
        rows += ownRows;
        sum += ownSum;
      });
    }
  }
  watch.stop();
  watch.print("scan", rows);
}

std::string firstDistribution(Engine& engine) {
  for (const Key& key : engine.keys())
    if (key.kind == KeyKind::Distribution) return key.name;
  return {};
}

// Merges as `show` does, without reading the table of logs. All results must have equal bits.
void merge(const char* where, std::size_t times) {
  Watch watch;
  const auto engine = openEngine(where, OpenMode::Read);
  const std::string key = firstDistribution(*engine);
  double mean = 0;
  for (std::size_t i = 0; i < times; ++i) {
    watch.start();
    MergedNumbers merged;
    engine->distributions(key, [&](std::span<const DistributionValue> rows) {
      for (const DistributionValue& row : rows)
        merged.add(row.numbers);
    });
    const FiveNumbers numbers = merged.numbers();
    watch.stop();
    if (i != 0 && numbers.mean != mean) std::exit(1);
    mean = numbers.mean;
  }
  watch.print("merge", times);
}

// The minimum that a similar client can ask about the same rows, and the equivalent of `merge` in
// the server's own arithmetic.
constexpr const char* kSum = "sum(mean)";
constexpr const char* kOwnMerge =
    "min(minimum), max(maximum), sum(count) AS n, sum(mean * count) / n AS average, "
    "sum(squared_deviations) + sum(count * mean * mean) - n * average * average";

void askServer(const char* where, std::size_t times, const std::string& columns) {
  Watch watch;
  const std::string key = firstDistribution(*openEngine(where, OpenMode::Read));
  Server server(readServerAddress(where));
  server.use(server.address().database);
  const std::string statement =
      "SELECT " + columns + " FROM distribution WHERE key = " + quoted(key);
  server.ask(statement);
  for (std::size_t i = 0; i < times; ++i) {
    watch.start();
    server.ask(statement);
    watch.stop();
  }
  watch.print("ask", times);
}

}  // namespace

int main(int count, char** arguments) {
  const std::string what = count > 2 ? arguments[1] : "";
  const auto number = [&](int index, std::size_t otherwise) {
    return index < count ? std::stoul(arguments[index]) : otherwise;
  };
  if (what == "append") {
    append(arguments[2], number(3, 10'000), number(4, 1000),
           Logs(number(5, kScalars), number(6, kDistributions)));
  } else if (what == "floor") {
    insertRows(arguments[2], number(3, 10'000), number(4, 1000));
  } else if (what == "scan") {
    scan(arguments[2], number(3, 1));
  } else if (what == "merge") {
    merge(arguments[2], number(3, 1));
  } else if (what == "sum" || what == "own") {
    askServer(arguments[2], number(3, 1), what == "sum" ? kSum : kOwnMerge);
  } else {
    return 2;
  }
}
