#include "daemon/app_info_listener.h"

#include <algorithm>
#include <gtest/gtest.h>

#include "daemon/app_info.h"
#include "daemon/entry.h"
#include "tests/fakes/fake_platform.h"

namespace tavrel {
namespace {

using plist::Array;
using plist::Dictionary;
using Messages = std::vector<std::string>;

const std::string kNeverCame = "never received requested AAI, so moving along without it";
const std::string kUnread = "error reading nand info, error 1 with message Unable to parse buffer";
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

struct ListenerTest : ::testing::Test {
  fakes::FakePlatform fake;

  ListenerTest() {
    fake.submission.enabled = false;
    fake.systemVersion.version = {};
  }

  /// Serves a client that sends these events, and returns what a run logs only when it serves.
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
      return message.ends_with(": no permission for that day");
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
  EXPECT_EQ(
      serve({kAnnounce, kDeliver}),
      (Messages{kAnnounced, "tavrel got requestedAAI:\n" + kList, "Day unchanged since last run",
                "dropped the list: the daily run had already taken place, and only a list "
                "delivered before it gets into the log"}));
}

TEST_F(ListenerTest, DoesNotMissAListWhoseRunFailed) {
  fake.preferences.keyWithoutMemory = "LastLogOutcome";
  EXPECT_EQ(serve({kAnnounce, kDeliver}),
            (Messages{kAnnounced, "tavrel got requestedAAI:\n" + kList, "daily tasks for day 19999",
                      "cannot go on serving: std::bad_alloc"}));
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
  // Messages of an unknown form leave the announcement open; those with another number close it.
  EXPECT_EQ(serve({{}, kAnnounce}).size(), 3U);
  EXPECT_EQ(serve({Dictionary{{"operation", 3}}, kAnnounce}), Messages{});
  EXPECT_EQ(fake.log.messages(LogLevel::Debug),
            Messages{"ignored operation 0: this process has already acted on a request"});
}

TEST_F(ListenerTest, ForcesADayOnce) {
  EXPECT_EQ(serve({Dictionary{{"operation", 1}, {"value", 18000}}, kAnnounce}),
            Messages{"daily tasks for day 18000"});
  EXPECT_EQ(fake.journal.back(), "roll support log") << "the gated run would note its day";
  EXPECT_EQ(serve({Dictionary{{"operation", (std::int64_t{7} << 32) + 1},
                              {"value", (std::int64_t{7} << 32) - 5}}}),
            Messages{"daily tasks for day -5"});
  // A message without a day, or with one that is not an integer, has an unknown form.
  EXPECT_EQ(serve({Dictionary{{"operation", 1}}, Dictionary{{"operation", 1}, {"value", 2.0}},
                   Dictionary{{"operation", 1}, {"value", 7}}}),
            Messages{"daily tasks for day 7"});
}

}  // namespace
}  // namespace tavrel
