#include <bit>
#include <csignal>
#include <map>
#include <sys/resource.h>

#include "platform/linux/store/sqlite_schema.h"
#include "platform/store_path.h"
#include "store_fixture.h"

namespace tavrel {
namespace {

TEST_F(StoreTest, WalksAndErasuresEndWhateverTheDaysAre) {
  set({{"a", kToday, 1}});
  // The content that a damaged page may have.
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

  // The lower bound is exclusive, the upper inclusive; rows are sorted by key, then by day.
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
  // Signs, denormals, infinities, and the bits of quiet and signalling not-a-numbers.
  constexpr std::uint64_t kSign = std::uint64_t{1} << 63, kInf = 0x7FF0000000000000;
  const auto patternOf = [](std::size_t i) {
    const std::uint64_t patterns[] = {0, kInf, kInf | 1, kInf | 8ULL << 48, 0x3FF0000000000001};
    return patterns[i % 5] ^ (i % 2 == 0 ? 0 : kSign) ^ (i % 3 == 0 ? 0x123 : 0);
  };
  // Sizes of transactions around the size of a chunk, each with values of two keys.
  std::size_t total = 0;
  std::vector<std::size_t> sizes = {1, 2, 1020, 1, 1, 1023, 3000, 0, 1};
  sizes.resize(sizes.size() + 2100, 1);
  for (const std::size_t size : sizes) {
    // A store made by an earlier version is used unchanged.
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
  // For each key: 9 chunks from the first transactions; from the others one of 1,024 values, one of
  // 63, 31 of 32, and 22 of one. The offsets of each are in another row.
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

  // More than may wait in memory.
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

/// A store that version 1 of the schema left: day 20784 with two distributions and two scalars.
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
    std::string text;
    const auto history = store_->openHistory();
    EXPECT_TRUE((*history)->walkScalars("", kToday, kToday, [&](auto key, auto, auto value, auto&) {
      text += format("%s=%lld ", key, value);
    }));
    EXPECT_TRUE((*history)->walkDistributions("", kToday, kToday,
                                              [&](auto key, auto, auto count, auto& values, auto&) {
                                                std::map<std::string, int> seen;
                                                for (const Sample& sample : take(values)) {
                                                  std::string letters, offset;
                                                  appendPacked(letters, offset, {{sample}});
                                                  ++seen[letters + offset];
                                                }
                                                text += format("%s %lld: ", key, count);
                                                for (const auto& [letters, times] : seen)
                                                  text += format("%d*%s ", times, letters);
                                              }));
    return text;
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
  const std::string start =
      "far 1024: 1024*ABCDEFGHabcd long 1026: 1024*ABCDEFGHabcd 2*IJKLMNOPefgh short ";
  const std::string before = "a=5 b=-6 " + start + "1: 1*QRSTUVWXijkl ";
  const std::string after = "a=5 b=7 " + start + "2: 1*QRSTUVWXijkl 1*YZ012345mnop ";
  EXPECT_EQ(content(), before);
  EXPECT_EQ(*(*store_->openHistory())->segmentPosition(0, SegmentName{}.identity), std::nullopt);
  store_->BHClientCheckpoint();
  EXPECT_EQ(sql("PRAGMA user_version"), Lines{"1"}) << "reading leaves it as it is";

  // No byte can be written beyond the limit: the process gets an error, or is killed.
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
      const std::string found = content();
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
  const auto positionIn = [&](const auto& reader, int i) {
    return *(*reader)->segmentPosition(segments[i].owner, segments[i].identity);
  };
  EXPECT_EQ(positionIn(store_->openHistory(), 0), std::nullopt) << "no store yet";
  for (const bool isCommitted : {false, true}) {
    auto batch = store_->beginBatch();
    ASSERT_TRUE((*batch)->setScalar(kToday, "k", 1));
    EXPECT_EQ(positionIn(batch, 0), std::nullopt);
    for (std::size_t i = 0; i < 3; ++i) {
      for (const std::string& position : {std::string("early"), positions[i]})
        ASSERT_TRUE(
            (*batch)->setSegmentPosition(segments[i].owner, segments[i].identity, position));
    }
    ASSERT_TRUE(!isCommitted || (*batch)->commit());
  }
  const auto history = store_->openHistory();
  ASSERT_TRUE((*history)->beginSnapshot());
  EXPECT_EQ(positionIn(history, 1), "");
  auto batch = store_->beginBatch();
  EXPECT_EQ(*(*batch)->segmentNames(), (std::vector{segments[1], segments[0], segments[2]}));
  EXPECT_EQ(positionIn(batch, 2), large);
  ASSERT_TRUE((*batch)->removeSegmentPosition(segments[2].owner, segments[2].identity));
  ASSERT_TRUE((*batch)->commit());
  EXPECT_EQ(positionIn(history, 2), large) << "as at the beginning of the snapshot";
  EXPECT_EQ(positionIn(store_->openHistory(), 2), std::nullopt);
  EXPECT_EQ(positionIn(store_->openHistory(), 0), "first");
}

}  // namespace
}  // namespace tavrel
