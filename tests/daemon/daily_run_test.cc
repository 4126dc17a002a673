#include "daemon/daily_run.h"

#include <algorithm>
#include <gtest/gtest.h>

#include "base/version.h"
#include "daemon/app_info.h"
#include "daemon/app_info_listener.h"
#include "daemon/entry.h"
#include "platform/persisted_state.h"
#include "tests/fakes/fake_platform.h"

namespace tavrel {
namespace {

using plist::Array;
using plist::Dictionary;
using Messages = std::vector<std::string>;
using std::chrono_literals::operator""ms;

constexpr const char* kDayKey = "LastCrashLogSerializationDateInDaysSince1970";

const std::string kNeverCame = "never received requested AAI, so moving along without it";
const std::string kNotPermitted = "no log for day 19999: diagnostic submission not allowed";

const std::string kUnread = "error reading nand info, error 1 with message Unable to parse buffer";

const std::string kTotal = "scalar com.norvane.lumenhall.DiskUsageUserTotalBlocks";
const std::string kFree = "scalar com.norvane.lumenhall.DiskUsageUserBlocksFree";
const fakes::Journal kTasks{"checkpoint", kTotal, kFree, "clean structured logs",
                            "roll support log"};
const std::string kOwn = "set com.norvane.tallied.tavrel ";
const fakes::Journal kGatedTasks{"checkpoint",
                                 kTotal,
                                 kFree,
                                 "clean structured logs",
                                 "roll support log",
                                 "checkpoint",
                                 kOwn + "LastLogOutcome",
                                 kOwn + kDayKey,
                                 "synchronize com.norvane.tallied.tavrel"};

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
    EXPECT_EQ(runTavrel(fake.platform, arguments, 5ms), 0);
  }
};

TEST_F(DailyRunTest, RunsOncePerDay) {
  runDailyIfNeeded(fake.platform, {});
  EXPECT_EQ(fake.journal, kGatedTasks);
  EXPECT_EQ(storedDay(), plist::Value(19999));
  EXPECT_EQ(fake.log.messages(), (Messages{"daily tasks for day 19999", kNotPermitted, kUnread}));

  fake.journal.clear();
  runDailyIfNeeded(fake.platform, {});
  EXPECT_EQ(fake.journal, fakes::Journal{});
  EXPECT_EQ(fake.log.messages().back(), "Day unchanged since last run");
}

TEST_F(DailyRunTest, RepeatsADayWhoseStatisticsAreNotKept) {
  fake.store.keepsValues = false;
  runDailyIfNeeded(fake.platform, {});
  EXPECT_FALSE(storedDay());
  EXPECT_EQ(fake.log.messages().back(),
            "the statistics of the run are not kept: day 19999 stays undone");
}

TEST_F(DailyRunTest, TracksOSChangesBetweenTidyingUp) {
  fake.systemVersion.version = {{kProductBuildVersionKey, "21A5"}};
  dailyTasksForDay(fake.platform, 19999, {});
  EXPECT_EQ(fake.journal, (fakes::Journal{"checkpoint", kTotal, kFree, "clean structured logs",
                                          kOwn + "LastOSUpdate", "roll support log"}));
}

// An absent day reads as 0, later than the day before 1970, and 2^40 as its low half, 0; the
// yesterday of the first day is the last one.
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
  // The last column is the days that are said to be missing.
  using Case = std::tuple<plist::Value, std::int32_t, std::string>;
  for (const auto& [stored, today, days] :
       {Case({}, 20000, ""), Case("19000", 20000, ""), Case(19998, 20000, ""),
        Case(19997, 20000, "1 (19998 to 19998)"), Case(16339, 20000, "3659 (16340 to 19998)"),
        Case(16338, 20000, ""), Case(-3, 2, "3 (-2 to 0)"), Case(std::int64_t{1} << 40, 20000, ""),
        Case(INT64_MIN, 20000, ""), Case(0, INT32_MIN, "")}) {
    fake.preferences.domain(kTavrelDomain).set(kDayKey, stored);
    fake.store.today = today;
    fake.log.entries.clear();
    runDailyIfNeeded(fake.platform, {});
    Messages info = fake.log.messages(LogLevel::Info);
    ASSERT_FALSE(info.empty());
    info.pop_back();  // why there is no log
    const std::string text = "days without a run that will not be reported: " + days;
    EXPECT_EQ(info, days.empty() ? Messages{} : Messages{text}) << textOf(stored) << " " << today;
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
  EXPECT_EQ(run(1), "no log for day 1: no usable whitelist");
  EXPECT_EQ(own.get("LastLogOutcome"), plist::Value("no-whitelist"));
  fake.setWhitelist({{"g", Dictionary{{"ScalarKeys", Dictionary{{"k", Dictionary::create()}}}}}});
  EXPECT_EQ(run(2), "no log for day 2: no value found for any whitelisted key");
  run(3);
  EXPECT_EQ(std::ranges::count(fake.journal, kOwn + "LastLogOutcome"), 0);
  fake.store.scalars = {{"k", 4, 1}, {"k", 5, 1}};
  EXPECT_EQ(run(4), "writing tallied log. yesterday=4");
  EXPECT_EQ(own.get("LastLogOutcome"), plist::Value("filed"));
  fake.submission.fails = true;
  EXPECT_EQ(run(5), "writing tallied log. yesterday=5");
  EXPECT_EQ(own.get("LastLogOutcome"), plist::Value("not-filed"));
}

TEST_F(DailyRunTest, ReportsOnlyWithPermissionAndAfterTheCheckpoint) {
  fake.store.scalars = {{"k", 19999, 1}};
  fake.setWhitelist({{"g", Dictionary{{"ScalarKeys", Dictionary{{"k", Dictionary::create()}}}}}});
  const Array apps{Dictionary{{"bundle", "a"}}};
  dailyTasksForDay(fake.platform, 19999, apps);
  EXPECT_EQ(fake.journal, kTasks);

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

  run({"tavrel", "-f"});
  EXPECT_EQ(fake.journal, kTasks);
  run({"tavrel", "-t"});
  EXPECT_EQ(fake.journal, kTasks);
  EXPECT_EQ(fake.log.messages()[1], "daily tasks for day 20000");

  for (const char* unknown : {"-D", "", "-x", "-dd", " -d"}) {
    run({"tavrel", unknown});
    EXPECT_EQ(fake.journal, fakes::Journal{});
    EXPECT_EQ(fake.log.messages()[1], std::string("Unknown arg: ") + unknown);
  }
  EXPECT_EQ(fake.streams.output, "");
  for (const char* help : {"-h", "--help"}) {
    run({"tavrel", help});
    EXPECT_EQ(fake.log.messages()[1], std::string("Unknown arg: ") + help);
    EXPECT_TRUE(fake.streams.output.starts_with("Usage: tavrel [-d | -f | -t]\n\n"));
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
    EXPECT_EQ(fake.eventLoop.slices, std::vector{5ms});
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
  fake.eventLoop.events = {[this] {
    fake.state.appInfoRequested = true;
    throw std::runtime_error("the message");
  }};
  run({"tavrel"});
  EXPECT_EQ(fake.log.messages(),
            (Messages{"tavrel started", "cannot go on serving: the message", kNeverCame,
                      "daily tasks for day 19999", kNotPermitted,
                      "cannot finish the storage statistics: std::bad_alloc", "tavrel ended"}));
  EXPECT_EQ(fake.journal, kGatedTasks);
}

TEST_F(DailyRunTest, EndsWithoutAFurtherRunWhenTheSystemSaysSo) {
  fake.state.appInfoRequested = true;
  fake.eventLoop.terminates = true;
  run({"tavrel"});
  EXPECT_EQ(fake.journal, fakes::Journal{});
  EXPECT_EQ(fake.log.messages(), (Messages{"tavrel started", "tavrel ended"}));
}

constexpr const char* kUuid = "00112233-4455-6677-8899-AABBCCDDEEFF";

plist::Data uuidBytes(std::size_t size) {
  const std::string_view bytes(
      "\x00\x11\x22\x33\x44\x55\x66\x77\x88\x99\xAA\xBB\xCC\xDD\xEE\xFF\x10", 17);
  return plist::Data(asBytes(bytes.substr(0, size)));
}

const std::string kList =
    R"([{"bundle": "com.example.walk", "version": "1.2", "orboID": 0, "arch": 0, )"
    R"("uuid": "00112233-4455-6677-8899-AABBCCDDEEFF"}])";

Dictionary app(const plist::Value& uuid) {
  return {{"bundle_id", "com.example.walk"}, {"version", "1.2"}, {"uuid", uuid}};
}

TEST(AppInfoTest, ConvertsElementsInOrderAndLeavesIncompleteOnesOut) {
  Dictionary full = app(uuidBytes(16));
  full.set("orbo_id", std::int64_t{-9223372036854775807});
  full.set("arch", 12);
  full.set("other", "dropped");
  Dictionary withoutVersion = app(kUuid);
  withoutVersion.remove("version");
  const Array entries = appInfoFrom({full, "no dictionary", withoutVersion, app("bad"),
                                     app(uuidBytes(15)), app(uuidBytes(17)), app(16), app(kUuid)});
  EXPECT_EQ(textOf(entries),
            R"([{"bundle": "com.example.walk", "version": "1.2", "orboID": -9223372036854775807, )"
            R"("arch": 12, "uuid": "00112233-4455-6677-8899-AABBCCDDEEFF"}, )" +
                kList.substr(1));
}

struct ListenerTest : DailyRunTest {
  /// Serves a client that sends these events, and yields what only a run that serves logs.
  Messages serve(const std::vector<plist::Value>& events) {
    fake.state = {};
    fake.journal.clear();
    fake.log.entries.clear();
    auto peer = std::make_shared<fakes::FakeServices::Peer>();
    fake.eventLoop.events.push_back([this, peer] {
      fake.services.peerHandler(*peer);
      EXPECT_TRUE(peer->resumed);
    });
    for (const plist::Value& event : events)
      fake.eventLoop.events.push_back([peer, event] { peer->handler(event); });
    const char* const arguments[] = {"tavrel"};
    runTavrel(fake.platform, arguments);
    EXPECT_EQ(fake.services.name, "com.norvane.tallied.tavrel");
    EXPECT_EQ(fake.eventLoop.slices.back(), std::chrono::seconds(10));
    Messages messages = fake.log.messages();
    std::erase(messages, kUnread);
    std::erase_if(messages, [](const std::string& message) {
      return message.ends_with(": diagnostic submission not allowed");
    });
    return {messages.begin() + 1, messages.end() - 1};
  }
};

const Dictionary kAnnounce{{"operation", 0}};
const Dictionary kDeliver{{"operation", 2}, {"app_data", Array{app(kUuid)}}};
const std::string kAnnounced = "notified of logging status, waiting for activate app info";

TEST_F(ListenerTest, RunsTheDayWithTheInformationDelivered) {
  EXPECT_EQ(serve({kAnnounce, kDeliver, kDeliver}),
            (Messages{kAnnounced, "tavrel got requestedAAI:\n" + kList, "daily tasks for day 19999",
                      "tavrel got (unsolicited -- so ignoring) AAI:\n" + kList}));
  EXPECT_EQ(std::ranges::count(fake.journal, "post com.norvane.tallied.tavrel.logging"), 1);
}

TEST_F(ListenerTest, RunsTheDayWithAnEmptyListOrNone) {
  EXPECT_EQ(serve({kAnnounce, Dictionary{{"operation", 2}, {"app_data", Array::create()}}}),
            (Messages{kAnnounced, "tavrel got requestedAAI:\n[]", "daily tasks for day 19999"}));
  fake.store.today = 20001;
  EXPECT_EQ(serve({kAnnounce, kAnnounce}),
            (Messages{kAnnounced, kNeverCame, "daily tasks for day 20000"}));
}

TEST_F(ListenerTest, IgnoresWhatNobodyAskedFor) {
  EXPECT_EQ(serve({kDeliver}), Messages{"tavrel got (unsolicited -- so ignoring) AAI:\n" + kList});
  for (const plist::Value& event :
       {plist::Value(), plist::Value("text"), plist::Value(Array{1}),
        plist::Value(Dictionary::create()), plist::Value(Dictionary{{"operation", "0"}}),
        plist::Value(Dictionary{{"operation", 0.0}}), plist::Value(Dictionary{{"operation", 2}})})
    EXPECT_EQ(serve({event}), Messages{});
  // Messages of unknown shape leave the announcement open, those with another number do not.
  EXPECT_EQ(serve({{}, kAnnounce}).size(), 3U);
  EXPECT_EQ(serve({Dictionary{{"operation", 3}}, kAnnounce}), Messages{});
  EXPECT_EQ(fake.log.messages(LogLevel::Debug),
            Messages{"ignored operation 0: this process has had its one request"});
}

TEST_F(ListenerTest, ForcesADayOnce) {
  EXPECT_EQ(serve({Dictionary{{"operation", 1}, {"value", 18000}}, kAnnounce}),
            Messages{"daily tasks for day 18000"});
  EXPECT_EQ(fake.journal, kTasks);
  EXPECT_EQ(serve({Dictionary{{"operation", (std::int64_t{7} << 32) + 1},
                              {"value", (std::int64_t{7} << 32) - 5}}}),
            Messages{"daily tasks for day -5"});
  // Without a day, or with one that is no integer, a message is of unknown shape.
  EXPECT_EQ(serve({Dictionary{{"operation", 1}}, Dictionary{{"operation", 1}, {"value", 2.0}},
                   Dictionary{{"operation", 1}, {"value", 7}}}),
            Messages{"daily tasks for day 7"});
}

}  // namespace
}  // namespace tavrel
