#include <chrono>
#include <nlohmann/json.hpp>

#include "base/text.h"
#include "device.h"
#include "platform/linux/service/socket_service.h"

namespace tavrel {
namespace {

using namespace std::chrono_literals;

struct SilentLog final : SystemLog {
  void write(LogLevel, std::string_view) override {}
};

struct SendTest : testing::Test {
  TemporaryDevice device;
};

TEST_F(SendTest, SendsWhatTheServiceUnderstands) {
  EXPECT_EQ(
      device.run({"send", "announce"}),
      fails("cannot connect to " + device.path("/run/tavrel/com.norvane.tallied.tavrel.socket") +
            ": No such file or directory; is the service started?"));

  const DeviceRoot root(device.path(""));
  SilentLog log;
  LinuxEventLoop loop;
  SocketServices services(loop, root, log);
  const auto listener = services.createListener("com.norvane.tallied.tavrel");
  ASSERT_TRUE(listener);
  std::vector<std::string> received;
  listener->setPeerHandler([&](PeerConnection& peer) {
    peer.setEventHandler([&](const plist::Value& event) {
      if (event) received.push_back(textOf(event));
    });
    peer.resume();
  });
  listener->resume();

  EXPECT_EQ(device.run({"send", "announce"}).status, 0);
  EXPECT_EQ(device.run({"send", "force", "2026-11-16"}),
            (Outcome{0, "Asked for the daily tasks of day 20773 (2026-11-16).\n",
                     "tavrelctl: the service acts on one request in its life: it ignores this one "
                     "if it has had another before\n"}));
  EXPECT_EQ(device.run({"send", "deliver", "-"},
                       R"([{"bundle_id": "org.example", "version": "1", "arch": 12,
                            "uuid": "00112233-4455-6677-8899-aABBccddEEff"}])"),
            prints("Delivered 1 application.\n"));
  while (received.size() < 3 && loop.runSlice(10s) == EventLoop::Slice::HandledEvent) {
  }
  EXPECT_EQ(
      received,
      (std::vector<std::string>{
          R"({"operation": 0})", R"({"operation": 1, "value": 20773})",
          R"({"app_data": [{"arch": 12, "bundle_id": "org.example", )"
          R"("uuid": "00112233-4455-6677-8899-aABBccddEEff", "version": "1"}], "operation": 2})"}));
  EXPECT_EQ(device.run({"send", "force", "tomorrow"}).status, 2);
}

TEST_F(SendTest, ChecksApplicationsBeforeItSends) {
  const std::string good = R"("bundle_id": "a", "version": "1", "orbo_id": 1, "arch": 1)";
  const std::vector<std::pair<std::string, std::string>> cases = {
      {"{}", "no array of applications"},
      {"[1]", "element 0 is no dictionary"},
      {R"([{"version": "1"}])", "application 0: \"bundle_id\" must be a string"},
      {R"([{"bundle_id": "a", "version": "1", "orbo_id": 1.5}])",
       "application 0: \"orbo_id\" must be an integer"},
      {"[{" + good + R"(, "uuid": "00112233-4455-6677-8899aaabbccddeeff"}])",
       "application 0: \"uuid\" must be a UUID, as text of 36 characters or 16 bytes of data"}};
  for (const auto& [document, reason] : cases)
    EXPECT_EQ(device.run({"send", "deliver", "-"}, document), fails("standard input: " + reason));
}

TEST_F(SendTest, NotificationsArePostedAndAwaited) {
  EXPECT_EQ(device.run({"notify", "wait", "org.example.n", "--timeout", "0"}),
            fails("org.example.n was not posted within 0 seconds"));
  for (const std::string timeout : {"nan", "abc", "-1", "1x"}) {
    EXPECT_EQ(device.run({"notify", "wait", "org.example.n", "--timeout", timeout}),
              fails("not a number of seconds: " + timeout + ": give 0 or more, such as 2.5", 2));
  }
  EXPECT_EQ(device.run({"notify", "post", "org.example.n"}),
            prints("org.example.n: posted 1 time\n"));
  EXPECT_EQ(Json::parse(device.run({"notify", "post", "org.example.n", "--json"}).out),
            Json({{"format_version", 1}, {"name", "org.example.n"}, {"count", 2}}));
  EXPECT_EQ(device.run({"notify", "post", "a/b"}), fails("a/b is not the name of a notification"));
}

}  // namespace
}  // namespace tavrel
