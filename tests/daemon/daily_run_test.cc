#include "daemon/daily_run.h"

#include <algorithm>
#include <array>
#include <gtest/gtest.h>

#include "base/version.h"
#include "daemon/entry.h"
#include "platform/persisted_state.h"
#include "tests/fakes/fake_platform.h"

namespace tavrel {
namespace {

using plist::Array;
using plist::Dictionary;
using Messages = std::vector<std::string>;
using std::chrono::milliseconds;

constexpr const char* kDayKey = "LastCrashLogSerializationDateInDaysSince1970";

const std::string kNeverCame = "never received requested AAI, so moving along without it";
const std::string kNotPermitted = "no log for day 19999: no permission for that day";

const std::string kUnread = "error reading nand info, error 1 with message Unable to parse buffer";

const std::string kTotal = "scalar com.norvane.lumenhall.DiskUsageUserTotalBlocks";
const std::string kFree = "scalar com.norvane.lumenhall.DiskUsageUserBlocksFree";
const fakes::Journal kTasks{"checkpoint", kTotal, kFree, "clean structured logs",
                            "roll support log"};
const std::string kOwn = "set com.norvane.tallied.tavrel ";
const fakes::Journal kGatedTasks = [] {
  fakes::Journal journal = kTasks;
  journal.insert(journal.end(), {"checkpoint", kOwn + "LastLogOutcome", kOwn + kDayKey,
                                 "synchronize com.norvane.tallied.tavrel"});
  return journal;
}();

struct DailyRunTest : ::testing::Test {
  fakes::FakePlatform fake;

  DailyRunTest() {
    fake.submission.enabled = false;
    fake.systemVersion.version = {};
  }

  plist::Value storedDay() { return fake.preferences.domain(kTavrelDomain).get(kDayKey); }

  void run(std::vector<const char*> arguments) {
    fake.log.entries.clear();
    fake.journal.clear();
    EXPECT_EQ(runTavrel(fake.platform, arguments, milliseconds(5)), 0);
  }
};

TEST_F(DailyRunTest, RepeatsADayWhoseStatisticsAreNotKept) {
  fake.store.keepsValues = false;
  Messages steps;
  runDailyIfNeeded(fake.platform, {}, [&](std::string_view step) { steps.emplace_back(step); });
  EXPECT_EQ(
      steps,
      (Messages{"Once-a-day gate", "Daily tasks", "Checkpoint of the statistics store", "Report",
                "Storage statistics", "Disk space", "Structured storage log and NAND information",
                "ECC events", "Report channels", "Clean-up of structured records",
                "OS changes and tasking", "Roll-over of the support log", "End of the gated run"}));
  EXPECT_FALSE(storedDay());
  EXPECT_EQ(fake.journal.back(), "synchronize com.norvane.tallied.tavrel");
  EXPECT_EQ(fake.log.messages().back(),
            "the run's statistics could not be saved: another run today repeats day 19999");
}

TEST_F(DailyRunTest, TracksOSChangesBetweenTidyingUp) {
  fake.systemVersion.version = {{kProductBuildVersionKey, "21A5"}};
  dailyTasksForDay(fake.platform, 19999, {});
  EXPECT_EQ(fake.journal, (fakes::Journal{"checkpoint", kTotal, kFree, "clean structured logs",
                                          kOwn + "LastOSUpdate", "roll support log"}));
}

// An absent day reads as 0, which is later than the day before 1970, and 2^40 as its low half, 0;
// the day before the first day is the last one.
TEST_F(DailyRunTest, ComparesDaysSignedAndIn32Bits) {
  using Case = std::tuple<plist::Value, std::int32_t, bool>;
  for (const auto& [stored, today, runs] :
       {Case({}, 0, false), Case({}, 2, true), Case(-5, 0, true), Case(20001, 20000, false),
        Case("19999", 20000, true), Case(std::int64_t{1} << 40, 20000, true),
        Case(INT32_MAX, 20000, false), Case(20000, INT32_MIN, true)}) {
    fake.preferences.domain(kTavrelDomain).set(kDayKey, stored);
    fake.store.today = today;
    fake.journal.clear();
    runDailyIfNeeded(fake.platform, {});
    EXPECT_EQ(!fake.journal.empty(), runs) << textOf(stored) << " on " << today;
  }
}

TEST_F(DailyRunTest, CountsTheDaysThatNobodyWillReport) {
  // The last column is the message about missing days.
  using Case = std::tuple<plist::Value, std::int32_t, std::string>;
  for (const auto& [stored, today, days] :
       {Case({}, 20000, ""), Case("19000", 20000, ""), Case(19998, 20000, ""),
        Case(19997, 20000, "1 day had no daily run, and has a log only if one was forced: 19998"),
        Case(16339, 20000,
             "3659 days had no daily run, and have logs only if forced: 16340 to 19998"),
        Case(16338, 20000, ""),
        Case(-3, 2, "3 days had no daily run, and have logs only if forced: -2 to 0"),
        Case(std::int64_t{1} << 40, 20000, ""), Case(INT64_MIN, 20000, ""),
        Case(0, INT32_MIN, "")}) {
    fake.preferences.domain(kTavrelDomain).set(kDayKey, stored);
    fake.store.today = today;
    fake.log.entries.clear();
    runDailyIfNeeded(fake.platform, {});
    Messages info = fake.log.messages(LogLevel::Info);
    ASSERT_FALSE(info.empty());
    info.pop_back();  // why there is no log
    EXPECT_EQ(info, days.empty() ? Messages{} : Messages{days}) << textOf(stored) << " " << today;
  }
}

TEST_F(DailyRunTest, SaysWhyThereIsNoLogAndRemembersIt) {
  const auto run = [this](int day) {
    fake.store.today = day + 1;
    fake.log.entries.clear();
    fake.journal.clear();
    runDailyIfNeeded(fake.platform, {});
    return fake.log.messages(LogLevel::Info).back();
  };
  const Dictionary& own = fake.preferences.domain(kTavrelDomain);
  fake.submission.enabled = true;
  EXPECT_EQ(run(1), "no log for day 1: no usable whitelist; see 'tavrelctl whitelist check'");
  EXPECT_EQ(own.get("LastLogOutcome"), plist::Value("no-whitelist"));
  fake.setWhitelist({{"g", Dictionary{{"ScalarKeys", Dictionary{{"k", Dictionary::create()}}}}}});
  EXPECT_EQ(run(2), "no log for day 2: no value found for any whitelisted key");
  run(3);
  EXPECT_EQ(std::ranges::count(fake.journal, kOwn + "LastLogOutcome"), 0);
  fake.store.scalars = {{"k", 4, 1}, {"k", 5, 1}, {"k", 6, 1}, {"k", 7, 1}};
  EXPECT_EQ(run(4), "writing tallied log. yesterday=4");
  EXPECT_EQ(own.get("LastLogOutcome"), plist::Value("filed"));
  const std::string inPart = " without statistics that could not be read; see the system log";
  fake.store.distributionsAreReadable = false;
  EXPECT_EQ(run(5), "a log for day 5" + inPart);
  EXPECT_EQ(own.get("LastLogOutcome"), plist::Value("filed-in-part"));
  fake.submission.fails = true;
  EXPECT_EQ(run(6), "writing tallied log. yesterday=6");
  EXPECT_EQ(own.get("LastLogOutcome"), plist::Value("not-filed"));
  fake.submission.fails = false;
  std::swap(fake.store.distributionsAreReadable, fake.store.scalarsAreReadable);
  EXPECT_EQ(run(7), "a log for day 7" + inPart);
  const std::string unreadable = ": not all statistics could be read; see the system log";
  EXPECT_EQ(run(8), "no log for day 8" + unreadable);
  EXPECT_EQ(own.get("LastLogOutcome"), plist::Value("store-unreadable"));
  std::swap(fake.store.distributionsAreReadable, fake.store.scalarsAreReadable);
  EXPECT_EQ(run(9), "no log for day 9" + unreadable);
}

TEST_F(DailyRunTest, ReportsOnlyWithPermissionAndAfterTheCheckpoint) {
  fake.store.scalars = {{"k", 19999, 1}};
  fake.setWhitelist({{"g", Dictionary{{"ScalarKeys", Dictionary{{"k", Dictionary::create()}}}}}});
  const Array apps{Dictionary{{"bundle", "a"}}};
  dailyTasksForDay(fake.platform, 19999, apps);
  EXPECT_EQ(fake.journal, kTasks);
  fake.submission.permissionReadable = false;
  EXPECT_EQ(dailyTasksForDay(fake.platform, 19999, apps), LogOutcome::PermissionUnknown);
  EXPECT_EQ(std::ranges::count(fake.log.messages(),
                               "no log for day 19999: the permission cannot be read"),
            1);

  fake.submission.enabled = true;
  fake.journal.clear();
  dailyTasksForDay(fake.platform, 19999, apps);
  EXPECT_EQ(fake.journal.front(), "checkpoint");
  EXPECT_EQ(fake.submission.lastLog().get("BHActivatedAppInfo"), plist::Value(apps));
  EXPECT_FALSE(storedDay());
}

TEST_F(DailyRunTest, TakesItsModeFromTheFirstArgument) {
  run({"tavrel", "-d", "-t"});
  EXPECT_EQ(fake.journal, kGatedTasks);
  EXPECT_EQ(fake.log.messages(), (Messages{"tavrel started", "daily tasks for day 19999",
                                           kNotPermitted, kUnread, "tavrel ended"}));
  EXPECT_EQ(storedDay(), plist::Value(19999));
  run({"tavrel", "-d"});
  EXPECT_EQ(fake.journal, fakes::Journal{});
  EXPECT_EQ(fake.log.messages(),
            (Messages{"tavrel started", "Day unchanged since last run", "tavrel ended"}));

  run({"tavrel", "-f"});
  EXPECT_EQ(fake.journal, kTasks);
  run({"tavrel", "-t"});
  EXPECT_EQ(fake.journal, kTasks);
  EXPECT_EQ(fake.log.messages()[1], "daily tasks for day 20000");

  for (const char* unknown : {"-D", "", "-x", "-dd", " -d"}) {
    fake.store.daysAsked = 0;
    run({"tavrel", unknown});
    EXPECT_EQ(fake.store.daysAsked, 1);
    EXPECT_EQ(fake.journal, fakes::Journal{});
    EXPECT_EQ(fake.log.messages()[1], std::string("Unknown arg: ") + unknown);
  }
  EXPECT_EQ(fake.streams.output, "");
  for (const char* help : {"-h", "--help"}) {
    run({"tavrel", help});
    EXPECT_EQ(fake.log.messages()[1], std::string("Unknown arg: ") + help);
    EXPECT_FALSE(runKindOf(std::array{"tavrel", help}));
    EXPECT_TRUE(
        fake.streams.output.starts_with("Usage: tavrel [-d | -f | -t | -h | --version]\n\n"));
    fake.streams.output.clear();
  }
  run({"tavrel", "--version"});
  EXPECT_EQ(fake.streams.output, format("tavrel %s\n", version()));
  run({});
  EXPECT_EQ(fake.log.messages(), (Messages{"tavrel started", "tavrel ended"}));
}

TEST_F(DailyRunTest, ServesUntilASliceHasPassedWithoutAnEvent) {
  for (const bool listens : {false, true}) {
    fake.services.available = listens;
    run({"tavrel"});
    EXPECT_EQ(fake.eventLoop.slices, std::vector{milliseconds(5)});
    EXPECT_EQ(fake.log.messages(), (Messages{"tavrel started", "tavrel ended"}));
    fake.eventLoop.slices.clear();
  }
  fake.eventLoop.events = {[] {}, [this] { fake.state.appInfoRequested = true; }, [] {}};
  run({"tavrel"});
  EXPECT_EQ(fake.eventLoop.slices.size(), 4U);
  EXPECT_EQ(fake.journal, kGatedTasks);
  EXPECT_EQ(fake.log.messages()[1], kNeverCame);
}

TEST_F(DailyRunTest, GoesOnBehindAnException) {
  struct : fakes::FakeRegistry {
    std::shared_ptr<DriverService> firstService(std::string_view) override {
      throw std::bad_alloc();
    }
  } failing;
  fake.drivers.behind = &failing;
  fake.controls.eccEvents.emplace_back(72);
  fake.eventLoop.events = {[this] {
    fake.state.appInfoRequested = true;
    throw std::runtime_error("the message");
  }};
  run({"tavrel"});
  EXPECT_EQ(fake.log.messages(),
            (Messages{"tavrel started", "cannot go on serving: the message", kNeverCame,
                      "daily tasks for day 19999", kNotPermitted,
                      "cannot finish the storage log and NAND information: std::bad_alloc",
                      "tavrel ended"}));
  EXPECT_EQ(fake.journal, kGatedTasks);
  EXPECT_EQ(fake.crashReporting.records.size(), 1U);
}

TEST_F(DailyRunTest, EndsWithoutAFurtherRunWhenTheSystemSaysSo) {
  fake.state.appInfoRequested = true;
  fake.eventLoop.terminates = true;
  run({"tavrel"});
  EXPECT_EQ(fake.journal, fakes::Journal{});
  EXPECT_EQ(fake.log.messages(), (Messages{"tavrel started", "tavrel ended"}));
}

}  // namespace
}  // namespace tavrel
