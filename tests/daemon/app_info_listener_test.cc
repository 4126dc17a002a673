#include "daemon/app_info_listener.h"

#include <gtest/gtest.h>

#include "daemon/app_info.h"
#include "daemon/entry.h"
#include "tests/fakes/fake_platform.h"

namespace tavrel {
namespace {

using plist::Array;
using plist::Dictionary;
using Messages = std::vector<std::string>;

constexpr const char* kUuid = "00112233-4455-6677-8899-AABBCCDDEEFF";

plist::Data uuidBytes(std::size_t size = 16) {
  std::vector<std::byte> bytes;
  for (std::size_t i = 0; i < size; ++i)
    bytes.push_back(static_cast<std::byte>(i * 0x11));
  return plist::Data(bytes);
}

Dictionary app(const plist::Value& uuid) {
  return {{"bundle_id", "com.example.walk"}, {"version", "1.2"}, {"uuid", uuid}};
}

TEST(AppInfoTest, ConvertsElementsInOrderAndLeavesIncompleteOnesOut) {
  Dictionary full = app(uuidBytes());
  full.set("orbo_id", std::int64_t{-9223372036854775807});
  full.set("arch", 12);
  full.set("other", "dropped");
  Dictionary withoutVersion = app(kUuid);
  withoutVersion.remove("version");
  const Array entries = appInfoFrom({full, "no dictionary", withoutVersion, app("bad"),
                                     app(uuidBytes(15)), app(uuidBytes(17)), app(16), app(kUuid)});
  EXPECT_EQ(entries, (Array{Dictionary{{"bundle", "com.example.walk"},
                                       {"version", "1.2"},
                                       {"orboID", std::int64_t{-9223372036854775807}},
                                       {"arch", 12},
                                       {"uuid", kUuid}},
                            Dictionary{{"bundle", "com.example.walk"},
                                       {"version", "1.2"},
                                       {"orboID", 0},
                                       {"arch", 0},
                                       {"uuid", kUuid}}}));
}

struct ListenerTest : ::testing::Test {
  fakes::FakePlatform fake;

  ListenerTest() {
    fake.submission.enabled = false;
    fake.systemVersion.version = {};
  }

  /// Serves clients that send these events in one process, and yields what was logged between the
  /// start and the end, without what each run logs on a device without storage and permission.
  Messages serve(const std::vector<plist::Value>& events) {
    fake.journal.clear();
    fake.log.entries.clear();
    fake.state = {};
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
    std::erase(messages, "error reading nand info, error 1 with message Unable to parse buffer");
    std::erase_if(messages, [](const std::string& message) {
      return message.ends_with(": diagnostic submission not allowed");
    });
    return {messages.begin() + 1, messages.end() - 1};
  }

  int runs() const {
    return static_cast<int>(
        std::count(fake.journal.begin(), fake.journal.end(), "clean structured logs"));
  }
  bool wasPosted() const {
    return std::count(fake.journal.begin(), fake.journal.end(),
                      "post com.norvane.tallied.tavrel.logging") == 1;
  }
};

const Dictionary kAnnounce{{"operation", 0}};
const Dictionary kDeliver{{"operation", 2}, {"app_data", Array{app(kUuid)}}};
const std::string kList =
    R"([{"bundle": "com.example.walk", "version": "1.2", "orboID": 0, "arch": 0, )"
    R"("uuid": "00112233-4455-6677-8899-AABBCCDDEEFF"}])";
const std::string kAnnounced = "notified of logging status, waiting for activate app info";
const std::string kNeverCame = "never received requested AAI, so moving along without it";

TEST_F(ListenerTest, RunsTheDayWithTheInformationDelivered) {
  EXPECT_EQ(serve({kAnnounce, kDeliver, kDeliver}),
            (Messages{kAnnounced, "tavrel got requestedAAI:\n" + kList, "daily tasks for day 19999",
                      "tavrel got (unsolicited -- so ignoring) AAI:\n" + kList}));
  EXPECT_TRUE(wasPosted());
  EXPECT_EQ(runs(), 1);
}

TEST_F(ListenerTest, RunsTheDayWithAnEmptyList) {
  EXPECT_EQ(serve({kAnnounce, Dictionary{{"operation", 2}, {"app_data", Array::create()}}}),
            (Messages{kAnnounced, "tavrel got requestedAAI:\n[]", "daily tasks for day 19999"}));
}

TEST_F(ListenerTest, RunsTheDayWithoutInformationThatNeverCame) {
  EXPECT_EQ(serve({kAnnounce, kAnnounce}),
            (Messages{kAnnounced, kNeverCame, "daily tasks for day 19999"}));
  EXPECT_TRUE(wasPosted());
}

TEST_F(ListenerTest, IgnoresWhatNobodyAskedFor) {
  EXPECT_EQ(serve({kDeliver}), Messages{"tavrel got (unsolicited -- so ignoring) AAI:\n" + kList});
  EXPECT_EQ(runs(), 0);
  EXPECT_EQ(serve({{},
                   "text",
                   Array{1},
                   Dictionary{{"operation", "0"}},
                   Dictionary::create(),
                   Dictionary{{"operation", 0.0}},
                   Dictionary{{"operation", 2}}}),
            Messages{});
  // Messages of unknown shape leave the announcement open, those with another number do not.
  EXPECT_EQ(serve({{}, kAnnounce}).size(), 3U);
  EXPECT_EQ(serve({Dictionary{{"operation", 3}}, kAnnounce}), Messages{});
  EXPECT_EQ(fake.log.messages(LogLevel::Debug),
            Messages{"ignored operation 0: this process has had its one request"});
}

TEST_F(ListenerTest, ForcesADayOnce) {
  EXPECT_EQ(serve({Dictionary{{"operation", 1}, {"value", 18000}}, kAnnounce}),
            Messages{"daily tasks for day 18000"});
  EXPECT_EQ(fake.journal,
            (fakes::Journal{"checkpoint", "scalar com.norvane.lumenhall.DiskUsageUserTotalBlocks",
                            "scalar com.norvane.lumenhall.DiskUsageUserBlocksFree",
                            "clean structured logs", "roll support log"}));
  // Numbers count with their low halves.
  EXPECT_EQ(serve({Dictionary{{"operation", (std::int64_t{7} << 32) + 1},
                              {"value", (std::int64_t{7} << 32) - 5}}}),
            Messages{"daily tasks for day -5"});
  // Without a day, or with one that is no integer, a message is of unknown shape.
  EXPECT_EQ(serve({Dictionary{{"operation", 1}}, Dictionary{{"operation", 1}, {"value", 2.0}},
                   Dictionary{{"operation", 1}, {"value", 7}}}),
            Messages{"daily tasks for day 7"});
}

TEST_F(ListenerTest, WaitsAlsoWithoutAListener) {
  fake.services.available = false;
  const char* const arguments[] = {"tavrel"};
  EXPECT_EQ(runTavrel(fake.platform, arguments), 0);
  EXPECT_EQ(fake.eventLoop.slices.size(), 1U);
  EXPECT_EQ(fake.log.messages(), (Messages{"tavrel started", "tavrel ended"}));
}

}  // namespace
}  // namespace tavrel
