#include <chrono>
#include <filesystem>
#include <gtest/gtest.h>
#include <memory>
#include <sstream>
#include <stdlib.h>
#include <string>
#include <vector>

#include "base/text.h"
#include "platform/linux/socket_service.h"
#include "tools/json_value.h"
#include "tools/send_commands.h"
#include "tools/tavrelctl.h"

namespace tavrel {
namespace {

using namespace std::chrono_literals;

struct SilentLog final : SystemLog {
  void write(LogLevel, std::string_view) override {}
};

class SendTest : public testing::Test {
 protected:
  void SetUp() override {
    std::string pattern = testing::TempDir() + "tavrel-send-XXXXXX";
    ASSERT_NE(mkdtemp(pattern.data()), nullptr);
    folder = pattern;
  }
  void TearDown() override { std::filesystem::remove_all(folder); }

  int run(std::vector<std::string> arguments, const std::string& input = {}) {
    arguments.insert(arguments.begin(), {"--root", folder});
    std::istringstream in(input);
    std::ostringstream outStream, errorStream;
    const int status = runTavrelctl(arguments, {in, outStream, errorStream});
    out = outStream.str();
    error = errorStream.str();
    return status;
  }

  std::string folder;
  std::string out;
  std::string error;
};

TEST_F(SendTest, SendsWhatTheServiceUnderstands) {
  const std::string socket = folder + "/run/tavrel/com.norvane.tallied.tavrel.socket";
  EXPECT_EQ(run({"send", "announce"}), 1);
  EXPECT_EQ(error, "tavrelctl: cannot connect to " + socket +
                       ": No such file or directory; is the service started?\n");

  const DeviceRoot root(folder);
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

  EXPECT_EQ(run({"send", "announce"}), 0) << error;
  EXPECT_EQ(run({"send", "force", "2026-11-16"}), 0) << error;
  EXPECT_EQ(out, "Asked for the daily tasks of day 20773 (2026-11-16).\n");
  EXPECT_EQ(run({"send", "deliver", "-"},
                R"([{"bundle_id": "org.example", "version": "1", "orbo_id": 0, "arch": 12,
                     "uuid": "00112233-4455-6677-8899-aABBccddEEff"}])"),
            0)
      << error;
  EXPECT_EQ(out, "Delivered 1 application.\n");
  while (received.size() < 3 && loop.runSlice(10s) == EventLoop::Slice::HandledEvent) {
  }
  EXPECT_EQ(
      received,
      (std::vector<std::string>{
          R"({"operation": 0})", R"({"operation": 1, "value": 20773})",
          R"({"app_data": [{"arch": 12, "bundle_id": "org.example", "orbo_id": 0, )"
          R"("uuid": "<00112233445566778899aabbccddeeff>", "version": "1"}], "operation": 2})"}));
  EXPECT_EQ(run({"send", "force", "tomorrow"}), 2);
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
       "application 0: \"uuid\" must be a UUID, as text of 36 characters or 16 bytes of data"},
  };
  for (const auto& [document, reason] : cases) {
    EXPECT_EQ(appDataOf(*parseJsonValue(document)).error().message, reason) << document;
    EXPECT_EQ(run({"send", "deliver", "-"}, document), 1);
    EXPECT_EQ(error, "tavrelctl: standard input: " + reason + "\n");
  }
}

TEST_F(SendTest, NotificationsArePostedAndAwaited) {
  EXPECT_EQ(run({"notify", "wait", "org.example.n", "--timeout", "0"}), 1);
  EXPECT_EQ(error, "tavrelctl: org.example.n was not posted within 0 seconds\n");
  for (const std::string timeout : {"nan", "abc", "-1", "1x"}) {
    EXPECT_EQ(run({"notify", "wait", "org.example.n", "--timeout", timeout}), 2);
    EXPECT_EQ(error,
              "tavrelctl: not a number of seconds: " + timeout + ": give 0 or more, such as 2.5\n");
  }
  EXPECT_EQ(run({"notify", "post", "org.example.n"}), 0) << error;
  EXPECT_EQ(out, "org.example.n: posted 1 time\n");
  EXPECT_EQ(run({"notify", "post", "org.example.n", "--json"}), 0) << error;
  EXPECT_EQ(Json::parse(out),
            Json({{"format_version", 1}, {"name", "org.example.n"}, {"count", 2}}));
  EXPECT_EQ(run({"notify", "post", "a/b"}), 1);
  EXPECT_EQ(error, "tavrelctl: a/b is not the name of a notification\n");
}

}  // namespace
}  // namespace tavrel
