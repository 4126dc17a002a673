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

  fake.systemVersion.version = {};
  EXPECT_EQ(track(), Journal{});
}

TEST_F(TaskingTest, AppliesOnceMoreWhatFoundNoMemory) {
  const Array payload{setting("b", "k", 1)};
  schedule({{"TaskingID", "one"}, {"TaskingDigest", 7}, {"TaskingPayload", payload}});
  for (const char* const key : {"TaskingOS", "TaskingDigest", "TaskingPayload"}) {
    fake.preferences.keyWithoutMemory = key;
    EXPECT_THROW(track(), std::bad_alloc) << key;
    EXPECT_EQ(nextTaskingChange(fake.platform), TaskingChange::Apply) << key;
  }
  fake.preferences.keyWithoutMemory.reset();
  track();
  EXPECT_EQ(own.get("TaskingPayload"), plist::Value(payload));
  EXPECT_EQ(nextTaskingChange(fake.platform), TaskingChange::None);
}

TEST_F(TaskingTest, AppliesUndoesAndAppliesAgain) {
  own = {{"LastOSUpdate", Dictionary{{"version", "21A5"}, {"day", 1}}}};
  const Array payload{setting("b", "k", 1), setting("a", "k", "x"), setting("b", "l", true),
                      Dictionary{{"Domain", "no key"}}, "no setting"};
  schedule({{"TaskingID", "one"}, {"TaskingDigest", 7}, {"TaskingPayload", payload}});

  const std::string set = "set com.norvane.tallied.tavrel Tasking";
  const Journal applied{"set b k", "set a k", "set b l",
                        // Then the data needed to undo them.
                        set + "ID", set + "OS", set + "Digest", set + "Payload", "synchronize a",
                        "synchronize b", "synchronize com.norvane.tallied.tavrel",
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
  const std::string remove = "remove com.norvane.tallied.tavrel Tasking";
  EXPECT_EQ(Journal(again.begin() + 1, again.begin() + 7),
            (Journal{"remove b k", "remove a k", "remove b l", remove + "ID", remove + "Digest",
                     remove + "Payload"}));
  EXPECT_EQ(Journal(again.begin() + 7, again.end()), applied);
  EXPECT_EQ(own.get("TaskingOS"), plist::Value("21B1"));

  // A tasking without a payload only reverts; it counts as new at every run.
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
             "cannot encode the property list, value /TaskingPayload/0/Value: the date is beyond "
             "any calendar"),
        Case(std::string(1048259, 'x'), "it needs 1048577 bytes; the limit is 1048576")}) {
    schedule({{"TaskingID", "two"}, {"TaskingPayload", Array{setting("a", "k", value)}}});
    EXPECT_EQ(track(), Journal{});
    EXPECT_EQ(fake.log.messages(),
              Messages{"cannot apply ScheduledTasking of domain com.norvane.Drovelink: " + why +
                       "; schedule one that preferences can store"});
  }
  const std::string most(1048258, 'x');
  schedule({{"TaskingID", "two"}, {"TaskingPayload", Array{setting("a", "k", most)}}});
  EXPECT_EQ(track().back(), "post com.norvane.da.tasking_changed");
}

TEST_F(TaskingTest, SubmitsAtOnceForSomeDaysAfterAnUpdate) {
  using Case = std::tuple<plist::Value, plist::Value, std::int32_t, const char*>;
  for (const auto& [days, updateDay, today, day] :
       {Case(3, 100, 100, "0"), Case(3, 100, 102, "2"), Case(3, 100, 103, nullptr),
        Case(3, 100, 98, "2"), Case(3, {}, 1, "1"), Case({}, 100, 100, nullptr),
        Case("3", 100, 100, nullptr), Case(-1, 100, 100, nullptr),
        Case(INT32_MAX, INT32_MIN, INT32_MAX, nullptr)}) {
    const Dictionary update{{"version", "21A5"}, {"day", updateDay}};
    own = {{"LastOSUpdate", update}, {"TaskingID", "one"}, {"TaskingOS", "21A5"}};
    schedule({{"TaskingID", "one"}});
    fake.store.today = today;
    fake.submission.taskingValues.set("AggressiveSubmissionDays", days);
    EXPECT_EQ(track(), day ? Journal{"submit now"} : Journal{}) << today;
    const std::string text = format("Aggressive submission day %s of 3", day);
    EXPECT_EQ(fake.log.messages(),
              day ? Messages{text + "; triggering log submission"} : Messages{});
  }
  // Without a scheduled tasking, or one without an identifier, nothing is submitted either.
  fake.store.today = 100;
  own.set("LastOSUpdate", Dictionary{{"version", "21A5"}, {"day", 100}});
  fake.submission.taskingValues.set("AggressiveSubmissionDays", 3);
  schedule({{"TaskingID", 1}});
  EXPECT_EQ(track(), Journal{});
  // A tasking that cannot be applied counts as scheduled.
  const std::string tooLong(1048259, 'x');
  schedule({{"TaskingID", "two"}, {"TaskingPayload", Array{setting("a", "k", tooLong)}}});
  EXPECT_EQ(track(), Journal{"submit now"});
  // So does one that this run applies.
  schedule({{"TaskingID", "two"}, {"TaskingPayload", Array{setting("a", "k", 1)}}});
  EXPECT_EQ(track().back(), "submit now");
}

}  // namespace
}  // namespace tavrel
