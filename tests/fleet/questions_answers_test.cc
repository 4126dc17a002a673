// Questions about whole fleets: what the answers contain, and what they must not reveal.
#include <algorithm>
#include <cmath>
#include <deque>
#include <gmock/gmock.h>
#include <map>
#include <random>

#include "engine_records.h"
#include "fleet/engine/open/open_engine.h"
#include "fleet/pages/sections.h"
#include "fleet/questions/compare.h"
#include "fleet/questions/grouping.h"
#include "fleet/questions/show.h"
#include "fleet/questions/summary.h"
#include "tests/devices/temporary_root.h"

namespace tavrel::fleet {
namespace {

using testing::ElementsAre;

constexpr double kInfinity = std::numeric_limits<double>::infinity();

// A fleet in SQLite.
class TestFleet {
 public:
  /// Adds a log, identified by the number of earlier logs; valid until the next one.
  LogRecord& add(std::int32_t day, std::string_view version, std::string_view region = "DE") {
    LogRecord& record = records_.emplace_back(makeRecord(records_.size(), day));
    record.osVersion = record.texts.keep(version);
    record.region = record.texts.keep(region);
    return record;
  }
  Engine& engine() {
    if (!records_.empty()) engine_->append(records_);
    records_.clear();
    return *engine_;
  }
  /// A new ledger of the logs so far.
  Ledger& ledger(std::size_t devicesAtLeast) {
    const LogTable& table = tables_.emplace_back(engine());
    return ledgers_.emplace_back(table, devicesAtLeast);
  }

 private:
  TemporaryRoot root_;
  std::unique_ptr<Engine> engine_ = openEngine(root_.root.path("/fleet.db"), OpenMode::Write);
  std::vector<LogRecord> records_;
  std::deque<LogTable> tables_;
  std::deque<Ledger> ledgers_;
};

std::vector<std::string> titles(const auto& groups) {
  std::vector<std::string> result;
  for (const auto& group : groups)
    result.push_back(group.name.text() + " " + std::to_string(group.devices) + "/" +
                     std::to_string(group.logs));
  return result;
}

TEST(ShowTest, TellsOfAScalarAndJoinsSmallGroups) {
  TestFleet fleet;
  for (int device = 0; device < 40; ++device) {
    const char* region = device < 20 ? "DE" : device < 35 ? "AT" : device < 38 ? "CH" : "LI";
    for (const int day : {1, 2}) {
      LogRecord& record = fleet.add(day, "OS 4.10", region);
      record.scalars = {{"s", device}};
    }
  }
  fleet.add(3, "OS 4.9");
  Ledger& ledger = fleet.ledger(5);
  const ShowRequest request{.key = "s", .by = GroupBy::Region};
  const ShowAnswer answer = show(fleet.engine(), ledger, request);
  ASSERT_EQ(answer.sides.size(), 1u);
  const ShowSide& side = answer.sides[0];
  EXPECT_THAT(titles(side.groups), ElementsAre("AT 15/30", "DE 20/40", "(other) 5/10"));
  EXPECT_EQ(side.joined, 2u);
  EXPECT_EQ(side.whole.logs, 80u);
  EXPECT_EQ(side.whole.scalar->mean, 19.5);
  EXPECT_EQ(side.whole.scalar->squaredDeviations, 2 * 40 * (1600 - 1) / 12.0);
  EXPECT_THAT(side.whole.scalar->percentiles, ElementsAre(1, 9, 19, 29, 37));
  // Only one device has 20, so that is in a bucket by itself.
  EXPECT_EQ(side.groups[0].histogram.pieces.front(), (Piece{15, 25, 12, 12}));
  EXPECT_EQ(side.whole.histogram.values, 80u);

  EXPECT_TRUE(show(fleet.engine(), fleet.ledger(21), request).sides[0].groups.empty());
  EXPECT_FALSE(show(fleet.engine(), fleet.ledger(41), request).sides[0].isShown);
  Ledger& again = fleet.ledger(5);
  const ShowAnswer beside =
      show(fleet.engine(), again, {.key = "s", .days = {1, 1}, .againstDays = DayRange{2, 3}});
  EXPECT_EQ(beside.sides[1].whole.logs, 40u);
  EXPECT_EQ(summarise(fleet.engine(), again, {}).parts[0].groups.size(), 0u);  // 4.9 has one device
}

TEST(ShowTest, JoinsTheSameValuesInWhateverOrderTheyWereLoaded) {
  TestFleet fleet;
  for (int region = 2000; region >= 1000; --region)
    fleet.add(region, "OS", std::to_string(region));
  const LogTable table(fleet.engine());
  EXPECT_EQ(groupsOf(table, logsOn(table, {}), GroupBy::Day, 1).at(1000).name.value, "1975-06-24");
  EXPECT_EQ(groupsOf(table, logsOn(table, {}), GroupBy::Region, 1).at(999).name.value, "1999");
}

TEST(ShowTest, MergesDistributionsAndBoundsTheirPercentiles) {
  TestFleet fleet;
  for (int device = 0; device < 20; ++device) {
    LogRecord& record = fleet.add(1, "OS 1");
    record.distributions = {{"d", {0, 30, static_cast<double>(device), 1, 4}}};
    record.cells = {{"d", -kInfinity, 10, "(-inf, 10]", device < 2 ? 2u : 3u}};
    if (device < 2) record.cells.push_back({"d", 20, kInfinity, "(20, inf)", 1});
    record.cells.push_back({"d", 10, 20, "(10, 20]", 1});
  }
  for (int device = 0; device < 3; ++device) {  // a whitelist with few devices, and one without
    LogRecord& record = fleet.add(1, "OS 1");
    record.distributions = {{"d", {1, 31, 10, 0, 2}}};
    if (device > 0) record.cells = {{"d", 5, 15, "(5, 15]", 2}};
  }
  fleet.add(1, "OS 1").distributions = {{"d", {}}};
  fleet.add(1, "OS 1").distributions = {{"d", {2, 40, std::nan(""), std::nan(""), 1}}};
  Ledger& ledger = fleet.ledger(5);
  const ShowAnswer answer =
      show(fleet.engine(), ledger, {.key = "d", .kind = KeyKind::Distribution});
  const ShownSet& whole = answer.sides[0].whole;
  EXPECT_EQ(whole.devices, 24u);
  EXPECT_EQ(whole.merged->numbers.count, 87u);
  EXPECT_EQ(whole.merged->numbers.maximum, 40);
  EXPECT_EQ(whole.merged->numbers.mean, (4 * 190 + 60) / 86.0);
  EXPECT_EQ(whole.merged->logsWithoutMean, 1u);
  // The two devices above 20 are joined with their neighbours. The 7 values of the last four
  // devices may lie anywhere, as may those of the smallest bucket.
  EXPECT_THAT(whole.histogram.pieces,
              ElementsAre(Piece{-kInfinity, 10, 58, 87}, Piece{10, kInfinity, 0, 29}));
  EXPECT_EQ(whole.histogram.values, 87u);
  EXPECT_THAT(
      whole.histogram.percentiles,
      ElementsAre(Interval{-kInfinity, 10}, Interval{-kInfinity, 10}, Interval{-kInfinity, 10},
                  Interval{-kInfinity, kInfinity}, Interval{-kInfinity, kInfinity}));
}

TEST(ShowTest, InventsNoValuesWhereCountsExceed64Bits) {
  TestFleet fleet;
  for (int device = 0; device < 5; ++device) {
    LogRecord& record = fleet.add(1, "OS 1");
    record.distributions = {{"d", {0, 3, 1, 1, 5}}};
    record.cells = {{"d", 0, 1, "(0, 1]", INT64_MAX},
                    {"d", 1, 2, "(1, 2]", INT64_MAX},
                    {"d", 2, 3, "(2, 3]", 2}};
  }
  Ledger& ledger = fleet.ledger(5);
  const ShowAnswer answer =
      show(fleet.engine(), ledger, {.key = "d", .kind = KeyKind::Distribution});
  EXPECT_EQ(answer.sides[0].whole.histogram.pieces.front().lower, 0);
}

TEST(ShowTest, TellsNoMeanOfFewDevices) {
  TestFleet fleet;
  for (int device = 0; device < 30; ++device) {
    const bool hasMean = device < 10 ? device < 4 : true;
    const double mean = hasMean ? device : kInfinity;
    fleet.add(1, device < 10   ? "OS 1"
                 : device < 20 ? "OS 2"
                               : "OS 3")
        .distributions = {{"d", {0, kInfinity, mean, 0, 1}}};
  }
  Ledger& ledger = fleet.ledger(5);
  const ShowAnswer answer =
      show(fleet.engine(), ledger, {.key = "d", .kind = KeyKind::Distribution, .by = GroupBy::Os});
  const ShowSide& side = answer.sides[0];
  EXPECT_EQ(side.whole.merged->numbers.mean, (6 + 145 + 245) / 24.0);
  EXPECT_EQ(side.groups[1].merged->numbers.mean, 14.5);
  // Subtracting the first from the second would reveal figures of four devices.
  for (const std::size_t group : {0u, 2u}) {
    EXPECT_TRUE(std::isnan(side.groups[group].merged->numbers.mean));
    EXPECT_EQ(side.groups[group].merged->deviation, std::nullopt);
    EXPECT_EQ(side.groups[group].merged->numbers.count, 10u);
  }
}

/// The logs that are in exactly one of the two sets.
LogSet differenceOf(const LogSet& a, const LogSet& b) {
  LogSet difference = a.without(b);
  difference.add(b.without(a));
  return difference;
}

/// Checks that everything computable from the shown sets is of enough devices: for each choice of
/// sets, the logs in exactly these are of no devices or of enough.
void expectNothingSmallFollows(const Ledger& ledger) {
  const LogTable& table = ledger.table();
  for (const auto& [subject, sets] : ledger.shown()) {
    for (const auto& a : sets) {
      EXPECT_GE(a->devices(table), ledger.devicesAtLeast());
      for (const auto& b : sets) {
        const std::size_t devices = differenceOf(*a, *b).devices(table);
        EXPECT_TRUE(devices == 0 || devices >= ledger.devicesAtLeast()) << subject << devices;
      }
    }
    if (subject == "logs") continue;  // it has several divisions
    std::map<std::vector<bool>, LogSet> cells;
    for (LogIndex log = 0; log < table.size(); ++log) {
      std::vector<bool> in;
      for (const auto& set : sets)
        in.push_back(set->contains(log));
      cells.try_emplace(in).first->second.insert(log);
    }
    cells.erase(std::vector<bool>(sets.size()));
    for (const auto& [in, logs] : cells)
      EXPECT_TRUE(ledger.hasEnough(logs)) << subject;
  }
}

/// Checks each union of groups of one division less all groups of another that it includes. A
/// union that groups of the other include is the rest of such a union.
void expectNothingSmallFollowsFromTwo(const std::vector<Division>& divisions,
                                      const Ledger& ledger) {
  for (const Division& one : divisions) {
    for (const Division& other : divisions) {
      if (&one == &other || one.groups.size() > 10) continue;
      for (std::size_t choice = 0; choice < std::size_t{1} << one.groups.size(); ++choice) {
        LogSet rest;
        for (std::size_t i = 0; i < one.groups.size(); ++i)
          if ((choice >> i & 1) != 0) rest.add(one.groups[i].logs);
        for (const Group& group : other.groups)
          if (rest.includes(group.logs)) rest = rest.without(group.logs);
        EXPECT_TRUE(rest.empty() || ledger.hasEnough(rest)) << choice;
      }
    }
  }
}

std::vector<Division> divisionsOf(Ledger& ledger) {
  std::vector<Division> divisions;
  for (const GroupBy by : {GroupBy::Os, GroupBy::Region, GroupBy::Digest, GroupBy::Day})
    divisions.push_back(
        divide(ledger, "logs",
               groupsOf(ledger.table(), logsOn(ledger.table(), {}), by, ledger.devicesAtLeast())));
  return divisions;
}

TEST(PrivacyTest, NothingSmallFollowsFromTwoDivisions) {
  TestFleet fleet;
  for (int device = 0; device < 100; ++device)
    fleet.add(1, "1",
              device < 50   ? "DE"
              : device < 75 ? "FR"
                            : "US")
        .whitelistDigest = device < 25                                   ? "d3"
                           : device < 50 || device == 60 || device >= 98 ? "d2"
                                                                         : "d1";
  Ledger& ledger = fleet.ledger(10);
  const SummaryAnswer answer = summarise(fleet.engine(), ledger, {});
  EXPECT_THAT(titles(answer.parts[1].groups), ElementsAre("DE 50/50", "FR 25/25", "US 25/25"));
  // d1 is FR and US without three logs.
  EXPECT_THAT(titles(answer.parts[2].groups), ElementsAre("d2 28/28", "(other) 72/72"));
  EXPECT_EQ(answer.parts[2].joined, 2u);

  std::minstd_rand random(7);
  std::size_t groups = 0;
  for (int turn = 0; turn < 300; ++turn) {
    TestFleet any;
    const auto noise = 1 + random() % 40;
    const auto regions = 2 + random() % 5;
    for (auto device = 20 + random() % 100; device != 0; --device) {
      const auto region = random() % regions;
      for (std::int32_t day = 0; day < 2; ++day) {
        const auto digest = random() % noise == 0 ? random() % 4 : region / 2 + device % 2;
        LogRecord& record = any.add(day, "1", "R" + std::to_string(region));
        record.whitelistDigest = record.texts.keep("d" + std::to_string(digest));
      }
    }
    Ledger& fresh = any.ledger(3 + random() % 8);
    const std::vector<Division> divisions = divisionsOf(fresh);
    for (const Division& division : divisions)
      groups += division.groups.size();
    expectNothingSmallFollowsFromTwo(divisions, fresh);
  }
  EXPECT_GT(groups, 1000u);
}

TEST(PrivacyTest, AChainOfManyGroupsIsJoined) {
  TestFleet fleet;
  for (int i = 0; i < 28; i += 2) {
    for (auto [devices, version, region] : {std::array{5, i, i},
                                            {3, i + 1, i},
                                            {5, i + 1, i + 1},
                                            {2, i, i + 1},
                                            {1, i < 26 ? i + 2 : 2, i + 1}})
      while (devices-- > 0)
        fleet.add(1, std::to_string(100 + version), std::to_string(100 + region));
  }
  Ledger& ledger = fleet.ledger(5);
  const auto regions = titles(summarise(fleet.engine(), ledger, {}).parts[1].groups);
  EXPECT_EQ(regions.back(), "(other) 24/24") << "100 and 101 less both versions: one device";
}

TEST(PrivacyTest, JoinsTheSameGroupsInWhateverOrderTheLogsWereLoaded) {
  const struct {
    const char* region;
    const char* version;
    unsigned devices;
  } groups[] = {{"r03", "o03", 3},  {"r04", "o04", 11}, {"r04", "o12", 8}, {"r04", "o13", 1},
                {"r05", "o05", 12}, {"r05", "o13", 7},  {"r06", "o06", 5}, {"r06", "o14", 7},
                {"r07", "o03", 2},  {"r07", "o07", 5},  {"r07", "o12", 1}, {"r07", "o14", 2},
                {"r07", "o15", 10}};
  std::vector<std::pair<const char*, const char*>> logs;
  for (const auto& [region, version, devices] : groups)
    logs.insert(logs.end(), devices, {version, region});
  std::minstd_rand random(1);
  for (int turn = 0; turn < 10; ++turn) {
    TestFleet fleet;
    for (const auto& [version, region] : logs)
      fleet.add(1, version, region);
    Ledger& ledger = fleet.ledger(5);
    EXPECT_THAT(titles(summarise(fleet.engine(), ledger, {}).parts[1].groups),
                ElementsAre("r04 20/20", "(other) 54/54"));
    std::shuffle(logs.begin(), logs.end(), random);
  }
}

TEST(PrivacyTest, APageLeavesSmallVersionsOut) {
  TestFleet fleet;
  for (int device = 0; device < 43; ++device)
    fleet.add(1, device < 3 ? "4.0" : device < 28 ? "4.1" : "4.2").scalars = {{"s", device}};
  LogRecord& talkative = fleet.add(1, "4.2");
  for (int key = 0; key < 45; ++key)
    talkative.scalars.push_back({talkative.texts.keep("a" + std::to_string(key)), 1});
  Ledger& ledger = fleet.ledger(10);
  const FleetPage page = askForPage(fleet.engine(), ledger, {});
  expectNothingSmallFollows(ledger);
  EXPECT_THAT(titles(page.summary.parts[0].groups), ElementsAre("4.1 25/25", "4.2 16/16"));
  EXPECT_EQ(page.summary.whole.logs, 41u);
  EXPECT_EQ(page.statistics.size(), 1u);
  EXPECT_EQ(page.furtherStatistics, 0u);
  EXPECT_EQ(page.comparison->comparisons.size(), 1u);
  EXPECT_THAT(titles(page.statistics.at(0).sides.at(0).groups),
              ElementsAre("4.1 25/25", "4.2 15/15"));
  EXPECT_EQ(page.statistics[0].sides[0].whole.logs, 40u);
  EXPECT_FALSE(show(fleet.engine(), ledger, {.key = "s"}).sides[0].isShown) << "all less the shown";

  fleet.add(2, "4.2").scalars = {{"rare", 1}};
  const SummaryAnswer summary = summarise(fleet.engine(), fleet.ledger(10), {});
  EXPECT_EQ(summary.whole.lastDay, 1) << "the second day has one device";
  EXPECT_EQ(summary.scalarKeys, 1u);
}

// Hands out one row of each of 24 logs, one by one, and counts them.
struct CountedRows : Engine {
  Appended append(std::span<const LogRecord>) override { return {}; }
  void logs(std::int32_t, std::int32_t, const Visitor<LogRow>&) override {}
  std::vector<Key> keys() override { return {}; }
  void scalars(std::string_view, const Visitor<ScalarValue>& visit) override { give(visit, {}); }
  void distributions(std::string_view, const Visitor<DistributionValue>& visit) override {
    give(visit, {.numbers = {.count = values}});
  }
  void cells(std::string_view, const Visitor<CellValue>& visit) override {
    give(visit, {.count = values});
  }
  std::unique_ptr<Engine> reader() override { return nullptr; }
  template <class Row>
  void give(const Visitor<Row>& visit, Row row) {
    rows = 0;
    try {
      while (rows < 24) {
        row.log = ++rows;
        visit({&row, 1});
      }
    } catch (const EnoughRows&) {
      return;
    }
  }
  LogId rows = 0;
  std::uint64_t values = 1;  // of each distribution and each bucket
};

TEST(SummaryTest, ReadsNoFurtherThanToEnoughDevices) {
  TestFleet fleet;
  for (int log = 0; log < 24; ++log)
    fleet.add(log % 2, "1");
  Ledger& ledger = fleet.ledger(5);
  const LogSet all = logsOn(ledger.table(), {});
  CountedRows engine;
  for (const KeyKind kind : {KeyKind::Scalar, KeyKind::Distribution, KeyKind::Histogram}) {
    EXPECT_TRUE(hasEnough(engine, ledger, all, {"k", kind}));
    EXPECT_EQ(engine.rows, 9U) << "the fifth log of a day";
    EXPECT_FALSE(hasEnough(engine, fleet.ledger(13), all, {"k", kind}));
    EXPECT_EQ(engine.rows, 24U);
  }
  engine.values = 0;
  EXPECT_FALSE(hasEnough(engine, ledger, all, {"k", KeyKind::Distribution}));
  EXPECT_FALSE(hasEnough(engine, ledger, all, {"k", KeyKind::Histogram}));
}

TEST(PrivacyTest, APageSaysWhichDaysItJoins) {
  TestFleet fleet;
  for (const auto& [day, devices] : {std::pair(1, 12), {2, 12}, {3, 11}, {4, 5}})
    for (int device = 0; device < devices; ++device)
      fleet.add(day, "1");
  Ledger& ledger = fleet.ledger(10);
  const std::string page = textOf(askForPage(fleet.engine(), ledger, {}));
  EXPECT_EQ(page.find("1970-01-03"), std::string::npos) << "the chart ends before the last day";
  EXPECT_THAT(page, testing::HasSubstr("Without 2 days, so that nothing reveals groups of fewer "
                                       "than 10 devices."));
  EXPECT_THAT(page, testing::HasSubstr("data for 2 of 3 days"));
}

TEST(PrivacyTest, NothingSmallFollowsFromTheAnswersOfARun) {
  std::minstd_rand random(3);
  std::size_t shown = 0;
  for (int turn = 0; turn < 60; ++turn) {
    TestFleet fleet;
    const auto devices = static_cast<int>(5 + random() % 60);
    const auto regions = 1 + random() % 8;
    for (int device = 0; device < devices; ++device) {
      const std::string region = "R" + std::to_string(random() % regions * (random() % regions));
      for (std::int32_t day = 0; day < 6; ++day) {
        if (random() % 4 == 0) continue;
        LogRecord& record =
            fleet.add(day, random() % 6 < static_cast<unsigned long>(day) ? "2" : "1", region);
        if (random() % 5 != 0) record.scalars = {{"s", static_cast<std::int64_t>(random() % 50)}};
      }
    }
    Ledger& ledger = fleet.ledger(3 + random() % 8);
    summarise(fleet.engine(), ledger, {});
    const auto by = static_cast<GroupBy>(random() % 5);
    ShowRequest request{.key = "s", .by = by};
    if (random() % 2 == 0) {
      request.days = {0, 2};
      request.againstDays = DayRange{3, 5};
    } else if (random() % 2 == 0) {
      request.againstVersion = "2";
    }
    const ShowAnswer answer = show(fleet.engine(), ledger, request);
    for (const ShowSide& side : answer.sides) {
      shown += side.groups.size();
      std::uint64_t values = 0;
      for (const ShownSet& set : side.groups) {
        values += set.logs;
        EXPECT_GE(set.devices, ledger.devicesAtLeast());
        EXPECT_EQ(set.histogram.values, set.logs);
        for (const Piece& piece : set.histogram.pieces)
          EXPECT_TRUE(piece.least == 0 || piece.least >= ledger.devicesAtLeast());
      }
      EXPECT_TRUE(side.groups.empty() || values == side.whole.logs);
    }
    expectNothingSmallFollows(ledger);
    compare(fleet.engine(), ledger, {"1", "2", {}});
    for (const auto& [subject, sets] : ledger.shown())
      for (const auto& a : sets)
        for (const auto& b : sets)
          EXPECT_TRUE(a == b || ledger.hasEnough(differenceOf(*a, *b))) << subject;
  }
  EXPECT_GT(shown, 100u);
}

TEST(CompareTest, PutsSmallChangesInWords) {
  Comparison one;
  one.before.mean = one.after.mean = 5;
  one.difference = -1e-9;
  one.relative = -2e-10;
  EXPECT_EQ(changeText(one), "lower (5 → 5)");
}

TEST(CompareTest, SaysWhatItCannotShow) {
  FleetPage facts;
  facts.comparison.emplace();
  page::HtmlWriter html;
  writeInShort(html, facts);
  EXPECT_THAT(std::string(html.written()),
              testing::HasSubstr(", no statistic could be compared.<"));
  Comparison same;  // on both sides 0, so its change is no share of the mean before
  same.adjustedPValue = 1;
  facts.comparison->comparisons = {same, same};
  writeChanges(html, *facts.comparison);
  EXPECT_THAT(std::string(html.written()),
              testing::HasSubstr(">2 more statistics without a change beyond chance.<"));
}

TEST(CompareTest, FindsWhatChangedAndOnlyThat) {
  TestFleet fleet;
  std::mt19937 random(4);
  std::normal_distribution<double> noise(100, 10);
  std::vector<std::string> names;
  for (int key = 0; key < 40; ++key)
    names.push_back("key" + std::to_string(key));
  for (int device = 0; device < 200; ++device) {
    const bool isNew = device % 2 == 0;
    for (std::int32_t day = 0; day < 3; ++day) {
      LogRecord& record = fleet.add(day, isNew ? "2" : "1");
      for (const std::string& name : names)
        record.scalars.push_back(
            {name, std::lround(noise(random)) + (isNew && name == "key7" ? 9 : 0)});
      record.scalars.push_back({"constant", isNew ? 2 : 1});
      record.scalars.push_back({"same", 5});
      record.scalars.push_back({isNew ? "new" : "old", 1});
      record.distributions = {{"key8", {0, 1, noise(random) - (isNew ? 20 : 0), 5, 9}},
                              {"odd", {0, 0, std::nan(""), 0, 1}},
                              {"small", {0, 1, device % 3 * 2e-162, 0, 1}},
                              {"tiny", {0, 1, device * 5e-172, 0, 1}}};
      if (device < 2) record.distributions[0].numbers.mean = std::nan("");
      if (device < 10) record.scalars.push_back({"rare", 1});
    }
  }
  Ledger& ledger = fleet.ledger(10);
  EXPECT_EQ(newestVersions(ledger, {})->second, "2");
  const CompareAnswer answer = compare(fleet.engine(), ledger, {"1", "2", {}});
  std::vector<std::string> found;
  for (const Comparison& one : answer.comparisons)
    if (one.isSignificant()) found.push_back(one.key.name);
  EXPECT_THAT(found, ElementsAre("constant", "key8", "key7"));
  EXPECT_EQ(answer.comparisons.size(), 43u);
  EXPECT_EQ(answer.leftOut, 2u) << "not those of fewer than ten devices";
  EXPECT_EQ(answer.unfit, 3u);
  EXPECT_EQ(answer.comparisons[1].after.logsWithoutMean, 3u);  // key8 of one device
  EXPECT_EQ(answer.comparisons[1].after.logs, 297u);
  const Comparison& slower = answer.comparisons[2];
  EXPECT_NEAR(slower.difference, 9, 2);
  EXPECT_NEAR(*slower.effect, 0.9, 0.2);
  // 100 devices per side on each of three days count as 100 values: 1.97 × √(2 × 10² / 100).
  EXPECT_NEAR(slower.margin, 2.79, 0.15);
  EXPECT_EQ(answer.comparisons[0].effect, std::nullopt);
  EXPECT_EQ(answer.comparisons.back().effect, 0);
}

// A rare event that none of ten devices had, but one of ten did before.
TEST(CompareTest, TakesNoFewEqualValuesForCertain) {
  TestFleet fleet;
  for (int device = 0; device < 310; ++device) {
    fleet.add(0, device < 10 ? "2" : "1").scalars = {
        {"rare", device % 10 == 0 && device > 9 ? 1 : 0}, {"moved", device < 10 ? 5 : device % 3}};
  }
  Ledger& ledger = fleet.ledger(10);
  const auto answer = compare(fleet.engine(), ledger, {"1", "2", {}});
  const Comparison& moved = answer.comparisons.at(0);
  EXPECT_EQ(moved.key.name, "moved");
  EXPECT_TRUE(moved.isSignificant());
  const Comparison& rare = answer.comparisons.at(1);
  EXPECT_EQ(rare.difference, -0.1);
  // The error is the root of 299 / 308 × 0.1 × 0.9 × 300 / 299 × (1 / 300 + 1 / 10).
  EXPECT_NEAR(rare.margin, 1.968 * 0.09519, 2e-4);
  EXPECT_NEAR(rare.pValue, 0.2943, 5e-4);
}

// Each device reports often and always the same. If its logs counted as independent values, they
// would show differences that do not exist.
TEST(CompareTest, TakesNoDayOfADeviceForAnotherDevice) {
  std::mt19937 random(5);
  std::normal_distribution<double> noise(0, 1000);
  int wrong = 0;
  for (int turn = 0; turn < 20; ++turn) {
    TestFleet fleet;
    for (int device = 0; device < 24; ++device) {
      const std::int64_t value = std::lround(noise(random));
      for (std::int32_t day = device % 5; day < 20; ++day)
        fleet.add(day, device < 12 ? "1" : "2").scalars = {{"s", value}};
    }
    Ledger& ledger = fleet.ledger(10);
    const auto answer = compare(fleet.engine(), ledger, {"1", "2", {}});
    wrong += answer.comparisons.at(0).isSignificant() ? 1 : 0;
  }
  EXPECT_LE(wrong, 3);
}

}  // namespace
}  // namespace tavrel::fleet
