#include <atomic>
#include <bit>
#include <csignal>
#include <limits>
#include <map>
#include <set>
#include <sqlite3.h>
#include <sys/resource.h>

#include "device_services.h"
#include "platform/linux/store/kept_values.h"
#include "platform/linux/store/sqlite_log_file.h"
#include "platform/linux/store/sqlite_schema.h"
#include "platform/linux/store/sqlite_store.h"
#include "platform/store_path.h"

namespace tavrel {
namespace {

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
void PrintTo(const Row& row, std::ostream* out) {
  *out << '"' << row.key.substr(0, 20) << "\"/" << row.day << '=' << row.value;
}
using Rows = std::vector<Row>;

using Sample = BHHistoryDistributionEnumerator::Sample;

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

  /// Runs SQL on the file as another program would; yields the first column of all rows.
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

  /// Moves the log into the file and removes it, as the last connection of another program does.
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

TEST_F(StoreTest, WalksAndErasuresEndWhateverTheDaysAre) {
  set({{"a", kToday, 1}});
  // As a damaged page may have it.
  sql("DROP TABLE scalars;"
      "CREATE TABLE scalars (day, key, value, PRIMARY KEY (day, key)) WITHOUT ROWID;"
      "INSERT INTO scalars VALUES (0, x'62', 1), (1.5, x'41', 2), (3, x'61', 4)");
  const auto history = store_->openHistory();
  ASSERT_TRUE(history);
  Rows rows;
  ASSERT_TRUE((*history)->walkScalar(
      "a", 0, 9, [&](std::string_view key, std::int32_t day, std::int64_t value, bool&) {
        rows.push_back({std::string(key), day, value});
      }));
  EXPECT_EQ(rows, (Rows{{"a", 3, 4}}));

  sql("INSERT INTO scalars VALUES ('7', x'61', 5), (x'08', x'61', 6)");
  EXPECT_EQ(*(*history)->days(), (std::vector<std::int32_t>{0, 1, 3}));
  ASSERT_TRUE(store_->erase({"", 0, 9}));
  EXPECT_EQ(*(*history)->days(), (std::vector<std::int32_t>{1}));
}

TEST_F(StoreTest, KeepsKeysAndValuesOfAnyKind) {
  const std::string nul("a\0b", 3);
  const std::string longKey(100'000, 'k');
  const Rows today = {{"", kToday, 0},          {"\x01\x1F\x7F", kToday, -1},
                      {"a", kToday, kSmallest}, {nul, kToday, kLargest},
                      {"a'\"%_;--", kToday, 1}, {"aa", kToday, 2},
                      {longKey, kToday, 3},     {"\xC3\xA9", kToday, 4},
                      {"\xFF", kToday, 5},      {"\xFF\xFF", kToday, 6}};
  set(Rows(today.rbegin(), today.rend()));
  set({{"a", kToday - 1, 7}, {"a", kFirstDay, 8}, {"a", kLastDay, 9}, {"b", kLastDay, 10}});

  const auto history = store_->initWithDefaultPath();
  EXPECT_EQ(scalars(*history, "", kToday - 1, kToday), today);

  // Bounds exclude the lower and include the upper day; several days come by key, then by day.
  using Case = std::tuple<std::string, std::int64_t, std::int64_t, Rows>;
  for (const auto& [prefix, min, max, rows] :
       {Case("a", kToday - 1, kToday, {today[2], today[3], today[4], today[5]}),
        Case(nul, kToday - 1, kToday, {today[3]}),
        Case("\xFF", kToday - 1, kToday, {today[8], today[9]}),
        Case("\xFF\xFF", kToday - 2, kToday, {today[9]}), Case("b", kToday - 1, kToday, {}),
        Case("", kToday, kToday, {}), Case("", kToday, kToday - 1, {}),
        Case("", kFirstDay, kToday - 1, {{"a", kToday - 1, 7}}),
        Case("", std::int64_t{kFirstDay} - 1, kFirstDay, {{"a", kFirstDay, 8}}),
        Case("", std::int64_t{kLastDay} - 1, kLastDay, {{"a", kLastDay, 9}, {"b", kLastDay, 10}}),
        Case("", kLargest, kLargest, {}), Case("", kSmallest, kSmallest, {}),
        Case("a", kSmallest, kToday - 1, {{"a", kFirstDay, 8}, {"a", kToday - 1, 7}}),
        Case("b", kSmallest, kLargest, {{"b", kLastDay, 10}}),
        Case("\xFF", kSmallest, kLargest, {today[8], today[9]})}) {
    EXPECT_EQ(scalars(*history, prefix, min, max), rows) << prefix << ' ' << min << ' ' << max;
  }

  int calls = 0;
  history->scalarsForKeyPrefix("", kSmallest, kLargest,
                               [&](auto, auto, auto, bool& stop) { stop = ++calls == 3; });
  EXPECT_EQ(calls, 3);

  const auto wide = store_->openHistory();
  const auto held = (*wide)->daysHeld();
  ASSERT_TRUE(held && *held);
  EXPECT_EQ(std::pair((*held)->first, (*held)->last), std::pair(kFirstDay, kLastDay));
  const Rows ofA = {{"a", kFirstDay, 8}, {"a", kToday - 1, 7}, today[2], {"a", kLastDay, 9}};
  for (const Rows& rows : {ofA, Rows{today[3]}, Rows{{"b", kLastDay, 10}}, Rows{today[9]}}) {
    Rows found;
    const auto add = [&](auto key, auto day, auto value, auto&) {
      found.push_back({std::string(key), day, value});
    };
    EXPECT_TRUE((*wide)->walkScalar(rows[0].key, kFirstDay, kLastDay, add));
    EXPECT_EQ(found, rows);
  }

  auto batch = store_->beginBatch();
  const std::string tooLong(limits::kStoreKeyBytes + 1, 'k');
  EXPECT_EQ((*batch)->setScalar(kToday, tooLong, 1).error().message,
            "statistics store " + store_->path() +
                ": a key of 1048577 bytes is refused: the longest allowed has 1048576");
  EXPECT_TRUE((*batch)->addScalar(kToday, "aa", kLargest - 2));
  EXPECT_EQ((*batch)->addScalar(kToday, "aa", 1).error().message,
            "adding 1 to 9223372036854775807 goes beyond 64 bits: set the value instead");
  EXPECT_TRUE((*batch)->setScalar(kToday, "new", -9));
  EXPECT_TRUE((*batch)->addScalar(kToday, "new", 4)) << "to what waits to be written";
  ASSERT_TRUE((*batch)->commit());
  EXPECT_EQ(scalars(*history, "new", kToday - 1, kToday), (Rows{{"new", kToday, -5}}));
  EXPECT_TRUE(log.lines.empty()) << log.lines[0];
}

TEST_F(StoreTest, KeepsEveryBitOfDistributionsInOrder) {
  // Signs, denormals, infinities and the bits of quiet and signalling not-a-numbers.
  constexpr std::uint64_t kSign = std::uint64_t{1} << 63, kInf = 0x7FF0000000000000;
  const auto patternOf = [](std::size_t i) {
    const std::uint64_t patterns[] = {0, kInf, kInf | 1, kInf | 8ULL << 48, 0x3FF0000000000001};
    return patterns[i % 5] ^ (i % 2 == 0 ? 0 : kSign) ^ (i % 3 == 0 ? 0x123 : 0);
  };
  // Sizes of transactions around the size of a chunk; two keys mixed in each.
  std::size_t total = 0;
  std::vector<std::size_t> sizes = {1, 2, 1020, 1, 1, 1023, 3000, 0, 1};
  sizes.resize(sizes.size() + 2100, 1);
  for (const std::size_t size : sizes) {
    // As an earlier version made it; it is used as it is.
    if (size == 1023) sql("PRAGMA journal_mode = DELETE; PRAGMA page_size = 4096; VACUUM");
    auto batch = store_->beginBatch();
    ASSERT_TRUE(batch);
    for (std::size_t i = 0; i < size; ++i, ++total) {
      const auto seconds = static_cast<std::uint32_t>(0xFFFFFFFF - total);
      const double value = std::bit_cast<double>(patternOf(total));
      ASSERT_TRUE((*batch)->appendValue(kToday, "d.one", seconds, value));
      ASSERT_TRUE((*batch)->appendValue(kToday, "d.two", 0, static_cast<double>(total)));
    }
    ASSERT_TRUE((*batch)->commit());
  }
  ASSERT_EQ(total, 7149U);
  // Of each key: 9 chunks of the first transactions; of the others one of 1,024 values and one of
  // 63, 31 of 32, and 22 of one. Each has its offsets in another row.
  EXPECT_EQ(sql("SELECT count(*) FROM chunks; PRAGMA page_size"), (Lines{"256", "4096"}));
  {
    auto forgotten = store_->beginBatch();
    ASSERT_TRUE((*forgotten)->appendValue(kToday, "d.one", 1, 1));
    ASSERT_TRUE((*forgotten)->setScalar(kToday, "s", 1));
  }
  EXPECT_EQ(scalarsOfToday(), Rows{});

  Lines keys;
  store_->initWithDefaultPath()->distributionsForKeyPrefix(
      "d.", kToday - 1, kToday, [&](auto key, auto, auto& values, auto&) {
        keys.emplace_back(key);
        const auto samples = take(values);
        ASSERT_EQ(samples.size(), total);
        for (std::size_t i = 0; i < total; ++i) {
          const bool isOne = key == "d.one";
          const auto expected =
              isOne ? patternOf(i) : std::bit_cast<std::uint64_t>(static_cast<double>(i));
          ASSERT_EQ(std::bit_cast<std::uint64_t>(samples[i].value), expected);
          ASSERT_EQ(samples[i].secondsInDayOffset, isOne ? 0xFFFFFFFF - i : 0);
        }
      });
  EXPECT_EQ(keys, (Lines{"d.one", "d.two"}));

  // More than waits in memory.
  auto batch = store_->beginBatch();
  const std::vector<Sample> many(700'000, Sample{1, 2});
  ASSERT_TRUE((*batch)->appendValues(kToday, "many", many));
  ASSERT_TRUE((*batch)->commit());
  std::size_t found = 0;
  EXPECT_TRUE((*store_->openHistory())
                  ->walkDistribution(
                      "many", kToday, kToday,
                      [&](auto, auto, auto, auto& values, auto&) { found = take(values).size(); }));
  EXPECT_EQ(found, many.size());
}

/// A store as version 1 of the schema left it: day 20784 with two distributions and two scalars.
constexpr const char* kVersion1 = R"(
PRAGMA page_size = 65536;
PRAGMA journal_mode = WAL;
CREATE TABLE scalars (day INTEGER NOT NULL, key BLOB NOT NULL, value INTEGER NOT NULL,
  PRIMARY KEY (day, key)) STRICT, WITHOUT ROWID;
CREATE TABLE distributions (day INTEGER NOT NULL, key BLOB NOT NULL, series INTEGER NOT NULL,
  count INTEGER NOT NULL, PRIMARY KEY (day, key)) STRICT, WITHOUT ROWID;
CREATE TABLE chunks (chunk INTEGER PRIMARY KEY, data BLOB NOT NULL) STRICT;
PRAGMA user_version = 1;
INSERT INTO scalars VALUES (20784, CAST('a' AS BLOB), 5), (20784, CAST('b' AS BLOB), -6);
INSERT INTO distributions VALUES (20784, CAST('long' AS BLOB), 0, 1026),
  (20784, CAST('short' AS BLOB), 1, 1);
INSERT INTO chunks VALUES
  (0, CAST(replace(hex(zeroblob(1024)), '00', 'ABCDEFGHabcd') AS BLOB)),
  (1, CAST('IJKLMNOPefghIJKLMNOPefgh' AS BLOB)), (1048576, CAST('QRSTUVWXijkl' AS BLOB));
-- The last series that could exist, and whole chunks.
INSERT INTO distributions VALUES (20784, CAST('far' AS BLOB), 4398046511103, 1024);
INSERT INTO chunks VALUES
  (4398046511103 << 20, CAST(replace(hex(zeroblob(1024)), '00', 'ABCDEFGHabcd') AS BLOB));
)";

TEST_F(StoreTest, ReadsAndConvertsVersion1) {
  std::filesystem::create_directories(std::filesystem::path(store_->path()).parent_path());
  sql(kVersion1);
  const std::string original = contentOf(store_->path());
  // Values and offsets as the letters that they are stored as, with the number of repetitions.
  const auto content = [this] {
    Lines lines;
    const auto history = store_->openHistory();
    EXPECT_TRUE((*history)->walkScalars("", kToday, kToday, [&](auto key, auto, auto value, auto&) {
      lines.push_back(std::string(key) + "=" + std::to_string(value));
    }));
    EXPECT_TRUE((*history)->walkDistributions(
        "", kToday, kToday, [&](auto key, auto, auto count, auto& values, auto&) {
          std::map<std::string, int> seen;
          for (const Sample& sample : take(values)) {
            std::string letters, offset;
            appendPacked(letters, offset, {{sample}});
            letters += offset;
            ++seen[letters];
          }
          lines.push_back(std::string(key) + " " + std::to_string(count));
          for (const auto& [letters, times] : seen)
            lines.push_back(letters + " " + std::to_string(times));
        }));
    return lines;
  };
  const auto write1 = [this] {
    auto batch = store_->beginBatch();
    if (!batch) return batch.error().message;
    EXPECT_TRUE((*batch)->setScalar(kToday, "b", 7));
    const double value = packedValueAt("YZ012345");
    EXPECT_TRUE((*batch)->appendValues(kToday, "short", {{{value, packedOffsetAt("mnop")}}}));
    const Status done = (*batch)->commit();
    return done ? std::string("done") : done.error().message;
  };
  const Lines before = {"a=5",
                        "b=-6",
                        "far 1024",
                        "ABCDEFGHabcd 1024",
                        "long 1026",
                        "ABCDEFGHabcd 1024",
                        "IJKLMNOPefgh 2",
                        "short 1",
                        "QRSTUVWXijkl 1"};
  const Lines after = {"a=5",
                       "b=7",
                       "far 1024",
                       "ABCDEFGHabcd 1024",
                       "long 1026",
                       "ABCDEFGHabcd 1024",
                       "IJKLMNOPefgh 2",
                       "short 2",
                       "QRSTUVWXijkl 1",
                       "YZ012345mnop 1"};
  EXPECT_EQ(content(), before);
  EXPECT_EQ(*(*store_->openHistory())->segmentPosition(0, SegmentName{}.identity), std::nullopt);
  store_->BHClientCheckpoint();
  EXPECT_EQ(sql("PRAGMA user_version"), Lines{"1"}) << "reading leaves it as it is";

  // No byte can be written beyond the limit: the process is told, or killed at once.
  int converted = 0, refused = 0;
  for (const bool isKilled : {false, true}) {
    for (rlim_t limit = 0; limit <= 1'300'000; limit += 50'000) {
      settle();
      write(kStorePath, original);
      SCOPED_TRACE(std::to_string(limit) + (isKilled ? ", killed" : ", told"));
      const auto convert = [&] {
        const rlimit room{limit, limit};
        signal(SIGXFSZ, isKilled ? SIG_DFL : SIG_IGN);
        setrlimit(RLIMIT_FSIZE, &room);
        const std::string outcome = write1();
        if (outcome == "done") return 0;
        EXPECT_EQ(outcome.find(where()), 0U);
        return outcome.find(
                   " cannot be converted to schema version 2 and stays readable: disk I/O "
                   "error (File too large): check the file") != outcome.npos
                   ? 1
                   : 2;
      };
      const int status = inChild(convert);
      const Lines found = content();
      EXPECT_TRUE(found == after || (found == before && status != 0));
      EXPECT_TRUE(status != 1 || sql("PRAGMA user_version") == Lines{"1"});
      if (found == after) ++converted;
      if (status == 1) ++refused;
    }
  }
  EXPECT_GT(converted, 0);
  EXPECT_GT(refused, 1);
  EXPECT_EQ(sql("PRAGMA user_version; PRAGMA integrity_check; SELECT count(*) FROM segments"),
            (Lines{"2", "ok", "0"}));
  EXPECT_EQ(corruptions(), 0);
}

TEST_F(StoreTest, PositionsOfSegmentsAreKeptWithTheValues) {
  const auto named = [](std::uint32_t owner, int number) {
    SegmentName name{owner, {}};
    name.identity.back() = static_cast<std::byte>(number);
    return name;
  };
  const SegmentName segments[] = {named(0, 2), named(0, 0), named(0xFFFFFFFF, 2)};
  const std::string large(138'000, '\0');
  const std::string positions[] = {"first", "", large};
  EXPECT_EQ(*(*store_->openHistory())->segmentPosition(0, segments[0].identity), std::nullopt)
      << "no store yet";
  for (const bool isCommitted : {false, true}) {
    auto batch = store_->beginBatch();
    ASSERT_TRUE((*batch)->setScalar(kToday, "k", 1));
    EXPECT_EQ(*(*batch)->segmentPosition(0, segments[0].identity), std::nullopt);
    for (std::size_t i = 0; i < 3; ++i) {
      ASSERT_TRUE((*batch)->setSegmentPosition(segments[i].owner, segments[i].identity, "early"));
      ASSERT_TRUE(
          (*batch)->setSegmentPosition(segments[i].owner, segments[i].identity, positions[i]));
    }
    ASSERT_TRUE(!isCommitted || (*batch)->commit());
  }
  const auto history = store_->openHistory();
  ASSERT_TRUE((*history)->beginSnapshot());
  EXPECT_EQ(*(*history)->segmentPosition(0, segments[1].identity), "");
  auto batch = store_->beginBatch();
  EXPECT_EQ(*(*batch)->segmentNames(), (std::vector{segments[1], segments[0], segments[2]}));
  EXPECT_EQ(*(*batch)->segmentPosition(segments[2].owner, segments[2].identity), large);
  ASSERT_TRUE((*batch)->removeSegmentPosition(segments[2].owner, segments[2].identity));
  ASSERT_TRUE((*batch)->commit());
  EXPECT_EQ(*(*history)->segmentPosition(segments[2].owner, segments[2].identity), large)
      << "as at the beginning of the snapshot";
  EXPECT_EQ(*(*store_->openHistory())->segmentPosition(segments[2].owner, segments[2].identity),
            std::nullopt);
  EXPECT_EQ(*(*store_->openHistory())->segmentPosition(0, segments[0].identity), "first");
}

TEST_F(StoreTest, ValuesThatCannotBeReadFailTheirKeyAlone) {
  auto batch = store_->beginBatch();
  ASSERT_TRUE((*batch)->appendValue(kToday, "bad\n", 1, 1));
  ASSERT_TRUE((*batch)->appendValue(kToday, "good", 2, 2));
  ASSERT_TRUE((*batch)->commit());
  batch->reset();
  settle();
  const std::string whole = contentOf(store_->path());
  const std::string ofBad = " WHERE key = CAST('bad' || char(10) AS BLOB)";
  // Whether a writer may append: it reads the row, but not the chunks.
  const std::tuple<std::string, std::string, bool> cases[] = {
      {"UPDATE chunks SET data = x'00' WHERE chunk = 0",
       "its values are not in the form that this program writes", true},
      {"DELETE FROM chunks WHERE chunk = 0", "it does not hold the 1 values that it counts", true},
      {"UPDATE chunks SET data = zeroblob(16) WHERE chunk = 0",
       "it does not hold the 1 values that it counts", true},
      {"DELETE FROM chunks WHERE chunk = 1", "it does not hold the 1 values that it counts", true},
      {"UPDATE chunks SET data = x'00' WHERE chunk = 1",
       "its values are not in the form that this program writes", true},
      {"UPDATE distributions SET count = 2" + ofBad, "it does not hold the 2 values that it counts",
       false},
      {"UPDATE distributions SET count = 0, runs = x''" + ofBad,
       "it does not hold the 0 values that it counts", false},
      {"UPDATE distributions SET count = -1" + ofBad,
       "it does not hold the -1 values that it counts", false},
      {"UPDATE distributions SET runs = x'000180'" + ofBad, "it refers to values that cannot exist",
       false},
      {"UPDATE distributions SET runs = x'FEFFFFFFFFFFFFFF7F0201'" + ofBad,
       "it refers to values that cannot exist", false},
      {"UPDATE chunks SET data = zeroblob(8 * 1025) WHERE chunk = 0",
       "its values are not in the form that this program writes", true}};
  for (const auto& [change, reason, takesMore] : cases) {
    SCOPED_TRACE(change);
    settle();
    write(kStorePath, whole);
    sql(change);
    log.lines.clear();
    const auto history = store_->openHistory();
    Lines seen;
    const auto see = [&](std::string_view key, BHHistoryDistributionEnumerator& values) {
      const auto size = take(values).size();
      seen.push_back(std::string(key) + std::to_string(size) + (values.failed() ? " failed" : ""));
    };
    const auto walk = [&](std::string_view unread) {
      const auto handler = [&](auto key, auto, auto, auto& values, auto&) {
        if (key != unread) see(key, values);
      };
      return (*history)->walkDistributions("", kFirstDay, kLastDay, handler);
    };
    EXPECT_TRUE(walk("bad\n"));
    const std::string line = where() + "distribution \"bad\\n\" of day 20784: " + reason +
                             ": restore the file from a copy or move it away";
    EXPECT_EQ(walk("").error().message, line);
    (*history)->distributionsForKeyPrefix(
        "", kToday - 1, kToday, [&](auto key, auto, auto& values, auto&) { see(key, values); });
    const std::string bad = "bad\n0 failed";
    EXPECT_EQ(seen, (Lines{"good1", bad, "good1", bad, "good1"}));
    EXPECT_EQ(log.lines, Lines{line});
    batch = store_->beginBatch();
    ASSERT_TRUE((*batch)->appendValue(kToday, "bad\n", 3, 3));
    EXPECT_EQ(static_cast<bool>((*batch)->commit()), takesMore);
    batch->reset();
  }
  settle();
  write(kStorePath, whole);
  sql("UPDATE distributions SET count = 2, runs = x'000202'" + ofBad);
  EXPECT_EQ((*store_->openHistory())
                ->walkDistribution("bad\n", kFirstDay, kLastDay,
                                   [&](auto, auto, auto, auto& values, auto&) { take(values); })
                .error()
                .message,
            where() +
                "distribution \"bad\\n\" of day 20784: it does not hold the 2 values that it "
                "counts: restore the file from a copy or move it away");
  sql("DELETE FROM chunks");
  EXPECT_TRUE((*store_->openHistory())
                  ->walkDistributions("", kFirstDay, kLastDay,
                                      [&](auto, auto, auto, auto& values, auto&) { take(values); })
                  .error()
                  .message.ends_with("; 1 more could not be read whole"));
  EXPECT_EQ(corruptions(), 0);
}

TEST_F(StoreTest, TheClientCommitsAtTheCheckpointAndAtTheEnd) {
  EXPECT_EQ(store_->BHDaysSince1970(), kToday);
  EXPECT_EQ(store_->dateForDaysSince1970(kFirstDay).secondsSince1970(), -185542587187200.0);
  store_->BHClientCheckpoint();
  EXPECT_FALSE(std::filesystem::exists(store_->path())) << "nothing to keep, nothing made";
  EXPECT_EQ(scalarsOfToday(), Rows{});
  EXPECT_EQ(log.lines, Lines{where() + "nothing has been recorded yet"});

  store_->BHClientSetValueForScalarKey("k", 1);
  store_->BHClientSetValueForScalarKey("k", 2);
  clock.time = plist::Date::since1970((kToday + 1) * 86400.0);
  store_->BHClientSetValueForScalarKey("k", 3);
  const auto reader = open();
  EXPECT_EQ(scalars(*reader->initWithDefaultPath(), "", kSmallest, kLargest), Rows{});

  // A reader at work keeps the log from being emptied, but not the values from being kept.
  set({{"other", kToday, 9}});
  log.lines.clear();
  const auto impatient = open(1);
  impatient->BHClientSetValueForScalarKey("late", 4);
  reader->initWithDefaultPath()->scalarsForKeyPrefix(
      "other", kToday - 1, kToday,
      [&](auto, auto, auto, auto&) { impatient->BHClientCheckpoint(); });
  EXPECT_EQ(log.lines, Lines{where() + "other processes still use the write-ahead log: what they "
                                       "need stays there until the next checkpoint"});

  const auto idle = reader->initWithDefaultPath();
  store_->BHClientCheckpoint();
  EXPECT_FALSE(logHoldsPages(store_->path()));
  const std::int32_t tomorrow = kToday + 1;
  EXPECT_EQ(
      scalars(*idle, "", kSmallest, kLargest),
      (Rows{{"k", kToday, 2}, {"k", tomorrow, 3}, {"late", tomorrow, 4}, {"other", kToday, 9}}));
  store_->BHClientSetValueForScalarKey("end", 5);
  store_.reset();
  EXPECT_EQ(scalars(*idle, "end", kSmallest, kLargest), (Rows{{"end", tomorrow, 5}}));
  for (const auto& [time, day] : {std::pair(1e300, kLastDay), std::pair(-0.5, -1)}) {
    clock.time = plist::Date::since1970(time);
    EXPECT_EQ(open()->BHDaysSince1970(), day);
  }
}

TEST_F(StoreTest, AnEmptiedLogKeepsItsFileAndWhatItHeldIsPast) {
  const std::string file = store_->path() + "-wal";
  {
    auto batch = store_->beginBatch();
    const std::vector<DistributionSample> samples(200'000, {1.5, 0});
    EXPECT_TRUE((*batch)->appendValues(kToday, "many", samples));
    EXPECT_TRUE((*batch)->setScalar(kToday, "k", 1));
    EXPECT_TRUE((*batch)->commit());
  }
  EXPECT_FALSE(logHoldsPages(store_->path()));
  EXPECT_EQ(std::filesystem::file_size(file), kKeptLogBytes);
  set({{"k", kToday, 2}});
  EXPECT_TRUE(logHoldsPages(store_->path()));
  // As after a power cut.
  std::filesystem::remove(store_->path() + "-shm");
  EXPECT_EQ(scalarsOfToday(), (Rows{{"k", kToday, 2}}));
  store_->BHClientCheckpoint();
  EXPECT_FALSE(logHoldsPages(store_->path()));
  EXPECT_EQ(std::filesystem::file_size(file), kKeptLogBytes);
  EXPECT_EQ(scalarsOfToday(), (Rows{{"k", kToday, 2}}));
}

TEST_F(StoreTest, ValuesOutlastALock) {
  set({{"k", kToday, 1}});
  log.lines.clear();
  const auto impatient = open(1);
  impatient->BHClientSetValueForScalarKey("k", 2);
  auto writer = store_->beginBatch();
  EXPECT_TRUE((*writer)->setScalar(kToday, "other", 1));
  EXPECT_TRUE(impatient->commit()) << "rows that wait in memory hold nobody up";
  impatient->BHClientSetValueForScalarKey("k", 3);
  EXPECT_TRUE((*writer)->addScalar(kToday, "other", 1));
  EXPECT_TRUE(impatient->commit()) << "kept beside the store";
  EXPECT_EQ(log.lines, Lines{where() + "database is locked: try again when the process that holds "
                                       "it has finished; 1 value waits for the next commit"});
  EXPECT_EQ(scalarsOfToday(), (Rows{{"k", kToday, 2}})) << "readers do not wait for writers";
  writer->reset();
  EXPECT_TRUE(impatient->commit());
  EXPECT_EQ(scalarsOfToday(), (Rows{{"k", kToday, 3}}));

  // The time for waiting is spent once, whatever is waited for.
  const auto budget = std::make_shared<BusyBudget>(20);
  const auto another = std::make_shared<BusyBudget>(20);
  const StoreFolderLock held(store_->path(), *another);
  EXPECT_THROW(StoreFolderLock(store_->path(), *budget), StoreFailure);
  EXPECT_FALSE(budget->wait());
  SqliteConnection first = openStoreForWriting(store_->path(), another);
  SqliteConnection second = openStoreForWriting(store_->path(), another);
  first.execute("BEGIN IMMEDIATE");
  EXPECT_THROW(second.execute("BEGIN IMMEDIATE"), StoreFailure);
  EXPECT_FALSE(another->wait());
}

TEST_F(StoreTest, KeptValuesAreTakenInOnce) {
  const std::string kept = store_->path() + "-kept";
  set({{"k", kToday, 1}});
  const auto impatient = open(1);
  const auto keep = [&](const char* key, std::int64_t value, bool commits = false) {
    auto writer = store_->beginBatch();
    EXPECT_TRUE((*writer)->addScalar(kToday, "lock", 1));
    impatient->BHClientSetValueForScalarKey(key, value);
    EXPECT_TRUE(impatient->BHClientCheckpoint());
    EXPECT_TRUE(!commits || (*writer)->commit());
  };
  keep("k", 2);
  keep("j", 3);
  EXPECT_EQ(scalarsOfToday(), (Rows{{"k", kToday, 1}}));
  EXPECT_EQ(FileSystem::status(kept)->st_mode & 0777U, 0640U);
  const std::string content = contentOf(kept);
  set({{"k", kToday, 4}});
  EXPECT_EQ(scalarsOfToday(), (Rows{{"j", kToday, 3}, {"k", kToday, 4}}));
  EXPECT_FALSE(std::filesystem::exists(kept));

  // As a kill between the commit and the removal leaves it; more is kept before it is seen.
  write(std::string(kStorePath) + "-kept", content);
  keep("j", 5);
  store_->BHClientCheckpoint();
  EXPECT_EQ(scalarsOfToday(), (Rows{{"j", kToday, 5}, {"k", kToday, 4}}));
  EXPECT_FALSE(std::filesystem::exists(kept));

  for (std::size_t i = 0; i < content.size(); i += 7) {
    std::string damaged = content;
    damaged[i] = static_cast<char>(damaged[i] ^ 1);
    write(std::string(kStorePath) + "-kept", i == 0 ? "cut" : damaged);
    store_->BHClientCheckpoint();
    EXPECT_EQ(log.lines.back(), "values kept in " + kept +
                                    " are lost: the file is damaged; it is now " + kept +
                                    "-damaged");
    EXPECT_FALSE(std::filesystem::exists(kept));
    EXPECT_EQ(scalarsOfToday(), (Rows{{"j", kToday, 5}, {"k", kToday, 4}}));
  }
  // What cannot be read is not replaced.
  std::filesystem::create_directory(kept);
  EXPECT_FALSE(KeptValues(store_->path()).add({{0, kToday, 1, "d"}}));
  EXPECT_TRUE(std::filesystem::is_directory(kept));
  std::filesystem::remove(kept);
  for (const char value : {'a', 'b', 'c'})
    keep(std::string(400'000, value).c_str(), 1);
  EXPECT_TRUE(log.says(kept + " is full: the 1 earliest values are dropped"));
  store_->BHClientCheckpoint();
  EXPECT_EQ(scalarsOfToday().size(), 4U);

  // What is kept between taking values in and their commit is not lost with them.
  keep("j", 6);
  keep("j", 7, true);
  EXPECT_TRUE(std::filesystem::exists(kept));
  store_->BHClientCheckpoint();
  EXPECT_EQ(scalarsOfToday().at(2).value, 7);
}

TEST_F(StoreTest, SetsAsideWhatSqliteFindsDamagedAndNothingElse) {
  set({{"old", kToday, 1}});
  for (int i = 0; i < 500; ++i)
    store_->BHClientSetValueForScalarKey("k" + std::to_string(i), i);
  store_->BHClientCheckpoint();
  settle();
  const std::string good = contentOf(store_->path());
  sql("CREATE TABLE more (x); PRAGMA user_version = 3");
  const std::string later = contentOf(store_->path());
  std::filesystem::remove(store_->path());
  sql("CREATE TABLE theirs (x)");
  const std::string foreign = contentOf(store_->path());

  std::string flipped = good.substr(0, 4096) + std::string(good.size() - 4096, 'x');
  const std::tuple<const char*, std::string, bool, const char*> cases[] = {
      {"empty", "", false, nullptr},
      {"good", good, false, nullptr},
      {"garbage", std::string(10'000, 'x'), true, "file is not a database"},
      {"two bytes", "SQ", true, "file is not a database"},
      {"half a page", good.substr(0, 300), true, "database disk image is malformed"},
      {"cut", good.substr(0, good.size() / 2), true, "database disk image is malformed"},
      {"flipped", flipped, true, "database disk image is malformed"},
      {"later", later, false,
       "has schema version 3, which this program does not know (it knows 1 and 2), and is left "
       "alone: "
       "update tavrel, or move the file away"},
      {"foreign", foreign, false,
       "holds the tables of another program and is left alone: move it away"}};
  for (const auto& [name, content, damaged, reason] : cases) {
    for (const bool byReader : {true, false}) {
      SCOPED_TRACE(std::string(name) + (byReader ? ", read" : ", written"));
      store_ = open();
      std::filesystem::remove_all(std::filesystem::path(store_->path()).parent_path());
      write(kStorePath, content);
      log.lines.clear();
      preferences.ZTXPreferencesSetValue("DatabaseCorruptionCount", {}, "com.norvane.tallied");

      if (byReader) {
        scalarsOfToday();
      } else {
        store_->BHClientSetValueForScalarKey("new", 1);
        store_->BHClientCheckpoint();
      }
      const std::string aside = store_->path() + ".corrupt-20261127T180218Z";
      EXPECT_EQ(setAsideFiles(), damaged ? Lines{aside} : Lines{});
      EXPECT_EQ(corruptions(), damaged ? 1 : 0);
      if (damaged) {
        ASSERT_EQ(log.lines.size(), byReader ? log.lines.size() : 1U);
        EXPECT_EQ(log.lines[0], where() + reason + ": the file has to be set aside; it is now " +
                                    aside + " and a new store begins: inspect or remove that file");
        EXPECT_EQ(contentOf(aside), content);
      } else if (reason) {
        scalarsOfToday();
        store_->BHClientCheckpoint();
        EXPECT_EQ(log.lines, Lines{where() + reason +
                                   (byReader ? "" : "; 1 value waits for the next commit")});
        EXPECT_EQ(contentOf(store_->path()), content);
      }
      EXPECT_TRUE(store_->commit()) << "or kept";
    }
  }
  // What was set while the store was another program's is still there for a store of our own.
  std::filesystem::remove(store_->path());
  EXPECT_TRUE(store_->commit());
  EXPECT_EQ(scalarsOfToday(), (Rows{{"new", kToday, 1}}));

  // Who finds the damage second does not set the new store aside.
  const StoreSite site{store_->path(), std::make_shared<BusyBudget>(1), clock, preferences, log};
  EXPECT_FALSE(site.setAside(FileIdentity{1, 1}, {StoreFault::Damaged, "damaged"}));
  EXPECT_EQ(scalarsOfToday().size(), 1U);

  const std::string elsewhere = root.path("/elsewhere");
  std::ofstream(elsewhere).close();
  const auto link = [&](const char* path) { return symlink(elsewhere.c_str(), path); };
  const auto pipe = [](const char* path) { return mkfifo(path, 0600); };
  const auto folder = [](const char* path) { return mkdir(path, 0700); };
  const std::pair<std::function<int(const char*)>, const char*> kObstacles[] = {
      {link, "is a symbolic link"},
      {pipe, "is not a regular file"},
      {folder, "is not a regular file"}};
  for (const auto& [make, what] : kObstacles) {
    std::filesystem::remove(store_->path());
    ASSERT_EQ(make(store_->path().c_str()), 0);
    log.lines.clear();
    store_ = open();
    EXPECT_EQ(scalarsOfToday(), Rows{});
    store_->BHClientSetValueForScalarKey("k", 1);
    EXPECT_TRUE(store_->commit()) << "kept";
    EXPECT_EQ(log.lines, Lines{where() + what + ": move it away"});
  }
  EXPECT_EQ(contentOf(elsewhere), "");
}

/// While it lives, one read of SQLite fails, or all from it on.
class FailingReads {
 public:
  FailingReads(int at, bool andLater) {
    system_ = sqlite3_vfs_find("unix");
    vfs_ = *system_;
    vfs_.zName = "failing";
    vfs_.xOpen = open;
    at_ = at;
    andLater_ = andLater;
    reads_ = 0;
    sqlite3_vfs_register(&vfs_, 1);
  }
  ~FailingReads() {
    sqlite3_vfs_unregister(&vfs_);
    sqlite3_vfs_register(system_, 1);
  }
  static bool hasFailed() { return reads_ >= at_; }

 private:
  static int open(sqlite3_vfs*, const char* name, sqlite3_file* file, int flags, int* outFlags) {
    const int code = system_->xOpen(system_, name, file, flags, outFlags);
    if (code != SQLITE_OK) return code;
    read_ = file->pMethods->xRead;
    sqlite3_io_methods& methods =
        methods_.try_emplace(file->pMethods, *file->pMethods).first->second;
    methods.xRead = read;
    file->pMethods = &methods;
    return code;
  }
  static int read(sqlite3_file* file, void* into, int size, sqlite3_int64 offset) {
    ++reads_;
    const bool fails = reads_ == at_ || (andLater_ && reads_ > at_);
    // What SQLite makes of EIO. Statements turn it into SQLITE_CORRUPT.
    return fails ? SQLITE_IOERR_CORRUPTFS : read_(file, into, size, offset);
  }

  static inline sqlite3_vfs* system_ = nullptr;
  static inline sqlite3_vfs vfs_{};
  // The database's and the log's.
  static inline std::map<const sqlite3_io_methods*, sqlite3_io_methods> methods_;
  static inline decltype(sqlite3_io_methods::xRead) read_ = nullptr;
  static inline int at_ = 0, reads_ = 0;
  static inline bool andLater_ = false;
};

TEST_F(StoreTest, SaysWhenMemoryIsMissing) {
  set({{"a", kToday, 1}});
  sqlite3_hard_heap_limit64(1);
  const auto batch = store_->beginBatch();
  sqlite3_hard_heap_limit64(0);
  ASSERT_FALSE(batch);
  EXPECT_EQ(batch.error().message, where() + "out of memory: free some memory");
}

TEST_F(StoreTest, AFailingReadIsNoDamage) {
  for (int i = 0; i < 3; ++i) {
    set({{"k" + std::to_string(i), kToday, i}});
    auto batch = store_->beginBatch();
    ASSERT_TRUE((*batch)->appendValue(kToday, "d", 1, i) && (*batch)->commit());
  }
  const auto readAll = [&] {
    const auto history = store_->initWithDefaultPath();
    std::size_t found = scalars(*history, "k", kToday - 1, kToday).size();
    history->distributionsForKeyPrefix(
        "", kToday - 1, kToday,
        [&](auto, auto, auto& values, auto&) { found += take(values).size(); });
    return found;
  };
  std::set<std::string> said;
  for (const bool writes : {false, true}) {
    for (const bool andLater : {false, true}) {
      for (int at = 1, hasFailed = 1; hasFailed != 0; ++at) {
        SCOPED_TRACE(std::to_string(at) + (andLater ? "+" : "") + (writes ? ", written" : ""));
        log.lines.clear();
        {
          const FailingReads reads(at, andLater);
          store_ = open();
          if (writes) store_->BHClientSetValueForScalarKey("w", at);
          if (writes) store_->BHClientCheckpoint();
          const std::size_t found = writes ? 6 : readAll();
          EXPECT_TRUE(found == 6 || !log.lines.empty()) << found;
          hasFailed = FailingReads::hasFailed();
        }
        said.insert(log.lines.begin(), log.lines.end());
        EXPECT_EQ(setAsideFiles(), Lines{});
        store_->BHClientCheckpoint();
        EXPECT_EQ(readAll(), 6U);
        EXPECT_EQ(scalars(*store_->initWithDefaultPath(), "w", kToday - 1, kToday),
                  writes ? Rows({{"w", kToday, at}}) : Rows{});
      }
    }
  }
  EXPECT_EQ(corruptions(), 0);
  EXPECT_TRUE(said.contains(where() + "looked damaged, but a second look found it sound: check "
                                      "the file system that holds it, and the memory that is "
                                      "free"));
}

TEST_F(StoreTest, ReadsWhereNothingCanBeWritten) {
  set({{"k", kToday, 1}});
  const std::string folder = std::filesystem::path(store_->path()).parent_path();
  const std::string rootFolder = root.path("");
  ASSERT_EQ(chmod(rootFolder.c_str(), 0755), 0);
  // Compares what a process sees that is restricted in some way.
  const auto restricted = [](auto restriction, const std::string& expected, auto action) {
    const auto compare = [&] { return !restriction() ? 2 : action() == expected ? 0 : 1; };
    EXPECT_EQ(inChild(compare), 0) << expected;
  };
  // A user who owns nothing here.
  const auto asAnother = [&](const std::string& expected, const auto& action) {
    const auto become = [] { return geteuid() != 0 || setresuid(65534, 65534, 65534) == 0; };
    restricted(become, expected, action);
  };
  const auto readAll = [&] {
    std::string text;
    for (const Row& row : scalarsOfToday())
      text += row.key + "=" + std::to_string(row.value) + ";";
    for (const std::string& line : log.lines)
      text += line + "\n";
    return text;
  };
  const auto writeAndTell = [&] {
    store_->BHClientSetValueForScalarKey("k", 3);
    store_->commit();
    store_->commit();
    return log.lines.size() == 1 ? log.lines[0] : std::to_string(log.lines.size()) + " lines";
  };
  const std::string advice =
      " (Permission denied): check owner and permissions of the file and its folder";
  const std::string waits = "; 1 value is not kept yet: cannot write " + store_->path() + "-kept: ";
  const std::string denied = "Permission denied; run as root or as the owner of the files";
  // There is no room for a single byte more.
  const auto full = [] {
    const rlimit none{0, 0};
    return signal(SIGXFSZ, SIG_IGN) != SIG_ERR && setrlimit(RLIMIT_FSIZE, &none) == 0;
  };
  restricted(full, "k=1;", readAll);
  restricted(
      full,
      where() + "disk I/O error: check the file system that holds it" + waits + "File too large",
      writeAndTell);
  // The log is left there with its index, which is read where it cannot be written.
  const auto letOthersRead = [&] {
    for (const char* ending : {"", "-wal", "-shm"})
      EXPECT_EQ(chmod((store_->path() + ending).c_str(), 0644), 0);
  };
  letOthersRead();
  asAnother("k=1;", readAll);
  // A writer that was alone leaves an empty index.
  const std::string index = store_->path() + "-shm";
  std::filesystem::remove(index);
  store_->BHClientSetValueForScalarKey("k", 1);
  EXPECT_TRUE(store_->commit());
  EXPECT_EQ(std::filesystem::file_size(index), 0U);
  EXPECT_EQ(FileSystem::status(index)->st_mode & 0777U, 0640U);
  letOthersRead();
  asAnother("k=1;", readAll);
  settle();
  ASSERT_EQ(chmod(store_->path().c_str(), 0444), 0);
  ASSERT_EQ(chmod(folder.c_str(), 0555), 0);
  asAnother("k=1;", readAll);
  asAnother(where() + "attempt to write a readonly database" + advice +
                "; 1 value is not kept yet: cannot lock " + folder + "/.lock: " + denied,
            writeAndTell);
  ASSERT_EQ(chmod(folder.c_str(), 0755), 0);
  write(std::string(kStorePath) + "-wal", "left behind");
  ASSERT_EQ(chmod(folder.c_str(), 0555), 0);
  asAnother(where() + "unable to open database file" + advice +
                "; its write-ahead log is only readable where the folder can be written: have a "
                "user who may write run 'tavrelctl stat list' once\n",
            readAll);

  // While a writer has the log open, its index is there to be read with it.
  ASSERT_EQ(chmod(folder.c_str(), 0755), 0);
  ASSERT_EQ(chmod(store_->path().c_str(), 0644), 0);
  std::filesystem::remove(store_->path() + "-wal");
  {
    const auto reader = store_->initWithDefaultPath();
    EXPECT_EQ(scalars(*reader, "", kToday - 1, kToday).size(), 1U);
    set({{"k", kToday, 2}});
    for (const char* ending : {"", "-wal", "-shm"}) {
      const std::string file = store_->path() + ending;
      EXPECT_EQ(FileSystem::status(file)->st_mode & 0777U, 0640U) << file;
    }
    letOthersRead();
    asAnother("k=2;", readAll);
  }
  ASSERT_EQ(chmod(store_->path().c_str(), 0600), 0);
  asAnother(where() + "unable to open database file" + advice + "\n", readAll);
}

TEST_F(StoreTest, ReadersThatChangeNothingLeaveNoTraceAndSayWhenWritersInterfered) {
  set({{"a", kToday, 1}, {"b", kToday, 2}});
  settle();
  const auto fileCount = [&] {
    const auto folder = std::filesystem::path(store_->path()).parent_path();
    return std::ssize(*FileSystem().list(folder));
  };
  SqliteStore reader(root, clock, preferences, log, 10'000, true);
  int rows = 0;
  const auto walk = [&](bool writesMeanwhile, std::ptrdiff_t filesMeanwhile) {
    rows = 0;
    return (*reader.openHistory())->walkScalars("", kToday, kToday, [&](auto, auto, auto, auto&) {
      ++rows;
      if (writesMeanwhile) {
        set({{"c", kToday, rows}});
        store_->BHClientCheckpoint();
      }
      EXPECT_EQ(fileCount(), filesMeanwhile);
    });
  };
  EXPECT_TRUE(walk(false, 1));
  EXPECT_EQ(rows, 2);
  EXPECT_EQ(walk(true, 3).error().message,
            where() + "was written while it was read: run the command again");
  const auto keepsTheLog = store_->openHistory();
  ASSERT_TRUE((*keepsTheLog)->daysHeld());
  set({{"d", kToday, 4}});
  EXPECT_TRUE(walk(false, 3));
  EXPECT_EQ(rows, 4) << "what still stands in the log is read";
}

TEST_F(StoreTest, NothingIsLostAmongWritersThatAreKilled) {
  // Each transaction adds one to a scalar and three values to a distribution, then tells so.
  const auto writeForEver = [this](int acknowledgements) {
    for (;;) {
      auto batch = store_->beginBatch();
      bool done = static_cast<bool>(batch);
      for (int value = 0; value < 3; ++value)
        done = done && (*batch)->appendValue(kToday, "d", 0, getpid());
      if (!done || !(*batch)->addScalar(kToday, "n", 1) || !(*batch)->commit()) _exit(1);
      if (::write(acknowledgements, ".", 1) != 1) _exit(2);
    }
  };
  std::int64_t expected = 0;
  for (int round = 0; round < 40; ++round) {
    int ends[2];
    ASSERT_EQ(pipe(ends), 0);
    pid_t writers[2];
    for (pid_t& writer : writers) {
      writer = fork();
      if (writer == 0) writeForEver(ends[1]);
    }
    close(ends[1]);
    // Killed at another place of a transaction each time; in the first rounds while the store is
    // being made.
    int acknowledged = 0;
    char byte;
    while (acknowledged < round % 7 && read(ends[0], &byte, 1) == 1)
      ++acknowledged;
    for (std::atomic<int> spin = 0; spin < (round % 10) * 20'000;)
      ++spin;
    for (const pid_t writer : writers) {
      kill(writer, SIGKILL);
      int status = 0;
      waitpid(writer, &status, 0);
      EXPECT_TRUE(WIFSIGNALED(status)) << "a writer failed";
    }
    while (read(ends[0], &byte, 1) == 1)
      ++acknowledged;
    close(ends[0]);

    std::int64_t kept = 0;
    std::size_t values = 0;
    for (const Row& row : scalarsOfToday())
      kept = row.value;
    store_->initWithDefaultPath()->distributionsForKeyPrefix(
        "", kToday - 1, kToday, [&](auto, auto, auto& all, auto&) { values = take(all).size(); });
    ASSERT_GE(kept, expected + acknowledged);
    ASSERT_LE(kept, expected + acknowledged + 2);
    ASSERT_EQ(values, static_cast<std::size_t>(kept) * 3);
    expected = kept;
  }
  EXPECT_GT(expected, 100);
  EXPECT_EQ(corruptions(), 0);
}

}  // namespace
}  // namespace tavrel
