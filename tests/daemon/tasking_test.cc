#include "daemon/tasking.h"

#include <cmath>
#include <gtest/gtest.h>

#include "platform/persisted_state.h"
#include "tests/fakes/fake_platform.h"

namespace tavrel {
namespace {

using fakes::Journal;
using plist::Array;
using plist::Dictionary;
using Messages = std::vector<std::string>;

Dictionary setting(const char* domain, const char* key, const plist::Value& value) {
  return {{"Domain", domain}, {"Key", key}, {"Value", value}};
}

struct TaskingTest : ::testing::Test {
  fakes::FakePlatform fake;
  Dictionary& own = fake.preferences.domain(kTavrelDomain);

  void schedule(const Dictionary& tasking) {
    fake.preferences.domain("com.norvane.Drovelink") = {{"ScheduledTasking", tasking}};
  }

  /// What one run does and says.
  Journal track() {
    fake.journal.clear();
    fake.log.entries.clear();
    trackOSChangeAndTasking(fake.platform);
    return fake.journal;
  }
};

TEST_F(TaskingTest, NotesAnOSUpdate) {
  fake.submission.taskingValues = {{"AggressiveSubmissionDays", 3}};
  EXPECT_EQ(track(), Journal{"set com.norvane.tallied.tavrel LastOSUpdate"});
  EXPECT_EQ(fake.log.messages(), Messages{"OS change since last run ((null) -> 21A5)"});
  EXPECT_EQ(own.get("LastOSUpdate"), plist::Value(Dictionary{{"version", "21A5"}, {"day", 20000}}));

  EXPECT_EQ(track(), Journal{});

  fake.systemVersion.version = {{kProductBuildVersionKey, "21B1"}};
  track();
  EXPECT_EQ(fake.log.messages(), Messages{"OS change since last run (21A5 -> 21B1)"});

  fake.systemVersion.version = {};
  EXPECT_EQ(track(), Journal{});
}

TEST_F(TaskingTest, AppliesUndoesAndAppliesAgain) {
  own = {{"LastOSUpdate", Dictionary{{"version", "21A5"}, {"day", 1}}}};
  const Array payload{setting("b", "k", 1), setting("a", "k", "x"), setting("b", "l", true),
                      Dictionary{{"Domain", "no key"}}, "no setting"};
  schedule({{"TaskingID", "one"}, {"TaskingDigest", 7}, {"TaskingPayload", payload}});

  const Journal applied{"set b k",
                        "set a k",
                        "set b l",
                        "set com.norvane.tallied.tavrel TaskingID",
                        "set com.norvane.tallied.tavrel TaskingOS",
                        "set com.norvane.tallied.tavrel TaskingDigest",
                        "set com.norvane.tallied.tavrel TaskingPayload",
                        "synchronize a",
                        "synchronize b",
                        "synchronize com.norvane.tallied.tavrel",
                        "post com.norvane.da.tasking_changed"};
  EXPECT_EQ(track(), applied);
  EXPECT_EQ(fake.log.messages(), Messages{});
  EXPECT_EQ(fake.preferences.domain("b"), (Dictionary{{"k", 1}, {"l", true}}));
  EXPECT_EQ(own.get("TaskingDigest"), plist::Value(7));
  EXPECT_EQ(own.get("TaskingPayload"), plist::Value(payload));

  EXPECT_EQ(track(), Journal{});

  // The same tasking on a new OS is removed and written again.
  fake.systemVersion.version = {{kProductBuildVersionKey, "21B1"}};
  const Journal again = track();
  EXPECT_EQ(fake.log.messages(), (Messages{"OS change since last run (21A5 -> 21B1)",
                                           "Tasking update (one -> one, 21A5 -> 21B1)"}));
  EXPECT_EQ(Journal(again.begin() + 1, again.begin() + 7),
            (Journal{"remove b k", "remove a k", "remove b l",
                     "remove com.norvane.tallied.tavrel TaskingID",
                     "remove com.norvane.tallied.tavrel TaskingDigest",
                     "remove com.norvane.tallied.tavrel TaskingPayload"}));
  EXPECT_EQ(Journal(again.begin() + 7, again.end()), applied);
  EXPECT_EQ(own.get("TaskingOS"), plist::Value("21B1"));

  // A tasking without a payload only undoes; it is new again at every run.
  schedule({{"TaskingID", "two"}});
  track();
  EXPECT_EQ(fake.log.messages(), Messages{"Tasking update (one -> two, 21B1 -> 21B1)"});
  EXPECT_TRUE(fake.preferences.domain("b").empty());
  EXPECT_FALSE(own.contains("TaskingID"));
  EXPECT_EQ(own.get("TaskingOS"), plist::Value("21B1"));
  EXPECT_EQ(track(), Journal{"post com.norvane.da.tasking_changed"});
  EXPECT_EQ(fake.log.messages(), Messages{});
}

TEST_F(TaskingTest, AppliesNothingThatItCouldNotUndo) {
  own = {{"LastOSUpdate", Dictionary{{"version", "21A5"}, {"day", 1}}}, {"TaskingID", "one"}};
  using Case = std::pair<plist::Value, std::string>;
  for (const auto& [value, why] :
       {Case(plist::Date::sinceEpoch(std::nan("")),
             "cannot encode the property list, value /TaskingPayload/0/Value: no calendar reaches "
             "the date"),
        Case(std::string(1048259, 'x'), "it needs 1048577 bytes and may have 1048576")}) {
    schedule({{"TaskingID", "two"}, {"TaskingPayload", Array{setting("a", "k", value)}}});
    EXPECT_EQ(track(), Journal{});
    EXPECT_EQ(fake.log.messages(),
              Messages{"cannot apply ScheduledTasking of domain com.norvane.Drovelink: " + why +
                       "; schedule one that preferences can hold"});
  }
  const std::string most(1048258, 'x');
  schedule({{"TaskingID", "two"}, {"TaskingPayload", Array{setting("a", "k", most)}}});
  EXPECT_EQ(track().back(), "post com.norvane.da.tasking_changed");
}

TEST_F(TaskingTest, SynchronisesEachDomainOnce) {
  own = {{"LastOSUpdate", Dictionary{{"version", "21A5"}, {"day", 1}}}};
  Array payload = Array::create();
  for (int i = 0; i < 5000; ++i)
    payload.append(setting(format("domain.%d", i % 1000).c_str(), format("%d", i).c_str(), i));
  schedule({{"TaskingID", "many"}, {"TaskingPayload", payload}});
  const Journal journal = track();
  std::map<std::string, int> synchronised;
  for (const std::string& call : journal) {
    if (call.starts_with("synchronize")) ++synchronised[call];
  }
  EXPECT_EQ(synchronised.size(), 1001U);
  for (const auto& [call, count] : synchronised)
    EXPECT_EQ(count, 1) << call;
  EXPECT_EQ(journal[journal.size() - 2], "synchronize com.norvane.tallied.tavrel");
}

TEST_F(TaskingTest, SubmitsAtOnceForSomeDaysAfterAnUpdate) {
  // The first column is the value of "AggressiveSubmissionDays".
  using Case = std::tuple<plist::Value, plist::Value, std::int32_t, const char*>;
  for (const auto& [days, updateDay, today, message] :
       {Case(3, 100, 100, "Aggressive submission day 0 of 3; triggering log submission"),
        Case(3, 100, 102, "Aggressive submission day 2 of 3; triggering log submission"),
        Case(3, 100, 103, nullptr),
        Case(3, 100, 98, "Aggressive submission day 2 of 3; triggering log submission"),
        Case(3, {}, 1, "Aggressive submission day 1 of 3; triggering log submission"),
        Case({}, 100, 100, nullptr), Case("3", 100, 100, nullptr), Case(-1, 100, 100, nullptr),
        Case(2147483647, std::numeric_limits<std::int32_t>::min(), 2147483647, nullptr)}) {
    Dictionary update{{"version", "21A5"}};
    update.set("day", updateDay);
    own = {{"LastOSUpdate", update}, {"TaskingID", "one"}, {"TaskingOS", "21A5"}};
    schedule({{"TaskingID", "one"}});
    fake.store.today = today;
    fake.submission.taskingValues.set("AggressiveSubmissionDays", days);
    EXPECT_EQ(track(), message ? Journal{"submit now"} : Journal{}) << today;
    EXPECT_EQ(fake.log.messages(), message ? Messages{message} : Messages{});
  }
  // Without a scheduled tasking, or one without an identifier, nothing is submitted either.
  fake.store.today = 100;
  own.set("LastOSUpdate", Dictionary{{"version", "21A5"}, {"day", 100}});
  fake.submission.taskingValues.set("AggressiveSubmissionDays", 3);
  schedule({{"TaskingID", 1}});
  EXPECT_EQ(track(), Journal{});
}

}  // namespace
}  // namespace tavrel
