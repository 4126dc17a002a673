// Commands that act on the daemon: requests, notifications, tasking.
#include "device.h"

#include <chrono>

#include "base/text.h"
#include "platform/linux/service/socket_service.h"

namespace tavrel {
namespace {

using namespace std::chrono_literals;

using Send = DeviceTest;

TEST_F(Send, SendsWhatTheServiceUnderstands) {
  device.check(
      "send announce",
      fails("cannot connect to " + device.path("/run/tavrel/com.norvane.tallied.tavrel.socket") +
            ": No such file or directory; start tavrel or its socket unit"));

  const DeviceRoot root(device.path(""));
  KeptLog log;
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

  EXPECT_EQ(device.run("send announce").status, 0);
  device.check("send force 2026-11-16",
               (Outcome{0, "Asked for the daily tasks of day 20773 (2026-11-16).\n",
                        "tavrelctl: a service process acts on one request: it ignores this one if "
                        "another came first\n"}));
  EXPECT_EQ(device.run("send deliver -",
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
  EXPECT_EQ(device.run("send force tomorrow").status, 2);
}

TEST_F(Send, ChecksApplicationsBeforeItSends) {
  const std::string good = R"("bundle_id": "a", "version": "1", "orbo_id": 1, "arch": 1)";
  const std::vector<std::pair<std::string, std::string>> cases = {
      {"{}",
       "not an array of applications: give dictionaries with \"bundle_id\", \"version\" and "
       "\"uuid\""},
      {"[1]", "element 0 is not a dictionary"},
      {R"([{"version": "1"}])", "application 0: \"bundle_id\" must be a string"},
      {R"([{"bundle_id": "a", "version": "1", "orbo_id": 1.5}])",
       "application 0: \"orbo_id\" must be an integer"},
      {"[{" + good + R"(, "uuid": "00112233-4455-6677-8899aaabbccddeeff"}])",
       "application 0: \"uuid\" must be a UUID, as text of 36 characters or 16 bytes of data"}};
  for (const auto& [document, reason] : cases)
    EXPECT_EQ(device.run("send deliver -", document), fails("standard input: " + reason));
}

TEST_F(Send, NotificationsArePostedAndAwaited) {
  device.check("notify wait org.example.n --timeout 0",
               fails("org.example.n was not posted within 0 seconds"));
  for (const std::string timeout : {"nan", "abc", "-1", "1x"}) {
    device.check("notify wait org.example.n --timeout " + timeout,
                 fails("not a number of seconds: " + timeout + ": give 0 or more, such as 2.5", 2));
  }
  device.check("notify post org.example.n", prints("org.example.n: posted 1 time\n"));
  EXPECT_EQ(device.json("notify post org.example.n"),
            R"({"format_version": 1, "name": "org.example.n", "count": 2})"_json);
  for (const std::string name : {"a/b", ".x"})
    device.check("notify post " + name,
                 fails("NAME: not the name of a notification: " + name +
                           ": give letters, digits, '.', '-' and '_', not beginning with '.', at "
                           "most 64: see 'tavrelctl notify post --help'",
                       2));
}

struct TaskingTest : DeviceTest {
  TaskingTest() {
    device.write("/etc/tavrel/system-version.plist", xmlOf(R"({"ProductBuildVersion": "B1"})"));
  }
};

TEST_F(TaskingTest, SchedulesShowsAndClears) {
  device.check("tasking show",
               prints("Scheduled tasking: none\nApplied tasking: none\nLast OS update: none seen\n"
                      "The next daily run changes nothing.\n"));
  EXPECT_EQ(device.json("tasking show")["applied"], nullptr);
  device.check("tasking clear", prints("No tasking is scheduled.\n"));

  EXPECT_EQ(device.run("tasking schedule -",
                       R"({"TaskingID": "t1", "TaskingDigest": 7, "TaskingPayload": [
                  {"Domain": "com.norvane.da", "Key": "AggressiveSubmissionDays", "Value": 3},
                  {"Domain": "d", "Key": "k", "Value": "x\n"}]})"),
            prints("Scheduled tasking t1 with 2 settings. The next daily run applies the scheduled "
                   "tasking.\n"));

  device.run("prefs set com.norvane.tallied.tavrel TaskingID t1");
  device.run("prefs set com.norvane.tallied.tavrel TaskingOS B1");
  device.run(
      R"(prefs set com.norvane.tallied.tavrel LastOSUpdate {"version":"B1","day":20000} --plist)");
  device.check("tasking show",
               prints("Scheduled tasking: t1\n  digest: 7\n  settings: 2\n"
                      "    DOMAIN          KEY                       VALUE\n"
                      "    com.norvane.da  AggressiveSubmissionDays  3\n"
                      "    d               k                         \"x\\n\"\n"
                      "Applied tasking: t1\n  OS build: B1\n  digest: -\n  settings: none\n"
                      "Last OS update: B1, first seen on day 20000 (2024-10-04)\n"
                      "The next daily run changes nothing.\n"));

  device.run("tasking schedule -", R"({"TaskingID": "t2"})");
  EXPECT_EQ(device.json("tasking show"), R"({"format_version": 1,
    "scheduled": {"TaskingID": "t2", "TaskingDigest": null, "TaskingPayload": null},
    "applied": {"TaskingID": "t1", "TaskingOS": "B1", "TaskingDigest": null,
                "TaskingPayload": null},
    "LastOSUpdate": {"day": 20000, "version": "B1"},
    "next_run": "undoes the applied tasking and applies the scheduled one"})"_json);
  const Outcome large =
      device.run("tasking schedule -",
                 R"({"TaskingID": "t3", "TaskingDigest": ")" + std::string(1U << 20, 'x') + "\"}");
  EXPECT_EQ(large.status, 1);
  EXPECT_EQ(large.out, "");
  device.check("tasking clear", prints("Removed scheduled tasking t2. Settings already applied "
                                       "stay; aggressive submission ends.\n"));
  EXPECT_TRUE(device.run("tasking show").out.starts_with("Scheduled tasking: none\n"));
}

TEST_F(TaskingTest, SaysWhatTheDaemonWouldDo) {
  const auto nextRun = [this](const std::string& tasking) {
    device.write("/var/mobile/Library/Preferences/com.norvane.Drovelink.plist",
                 xmlOf(R"({"ScheduledTasking": )" + tasking + "}"));
    return device.json("tasking show")["next_run"];
  };
  EXPECT_EQ(nextRun(R"({"TaskingID": 4})"), "changes nothing");
  EXPECT_EQ(nextRun(R"({"TaskingID": "t", "TaskingPayload": [], "TaskingDigest": ")" +
                    std::string(1U << 20, 'x') + "\"}"),
            "refuses the scheduled tasking, which preferences cannot store");
}

TEST_F(TaskingTest, RefusesWhatADeviceWouldNotApplyAsWritten) {
  const std::pair<const char*, std::vector<std::string>> cases[] = {
      {"[1]", {"tasking: must be a dictionary, not an array"}},
      {R"({"TaskingId": "x"})",
       {"TaskingId: is not a known key; the known ones are TaskingID, TaskingDigest, "
        "TaskingPayload",
        "TaskingID: is missing"}},
      {R"({"TaskingID": "", "TaskingPayload": {}})",
       {"TaskingID: must not be empty", "TaskingPayload: must be an array, not a dictionary"}},
      {R"({"TaskingID": 4, "TaskingPayload": [1, {"Domain": "../d", "Key": "k", "Value": 1},
          {"Key": "k", "value": 1}, {"Domain": "d", "Key": "k", "Value": 1},
          {"Domain": "d", "Key": "k", "Value": 2}]})",
       {"TaskingID: must be a string, not an integer",
        "TaskingPayload[0]: must be a dictionary, not an integer",
        "TaskingPayload[1]/Domain: is not the name of a preference domain",
        "TaskingPayload[2]/value: is not a known key; the known ones are Domain, Key, Value",
        "TaskingPayload[2]/Domain: is missing", "TaskingPayload[2]/Value: is missing",
        "TaskingPayload[4]: sets the same key as an earlier setting"}},
      {R"({"TaskingID": "t", "TaskingPayload": [{"Domain": "com.norvane.zentrix",
          "Key": "DiagnosticSubmissionFirstDay", "Value": 1}]})",
       {"TaskingPayload[0]: changes the permission to submit logs, which only the owner may: use "
        "'tavrelctl allow' or 'tavrelctl deny'"}},
      {R"({"TaskingID": "t", "TaskingPayload": [
          {"Domain": "com.norvane.da", "Key": "Usage", "Value": "false"},
          {"Domain": "com.norvane.da", "Key": "AggressiveSubmissionDays", "Value": [3]}]})",
       {"TaskingPayload[0]/Value: preference Usage of domain com.norvane.da is a boolean, not "
        "\"false\"",
        "TaskingPayload[1]/Value: preference AggressiveSubmissionDays of domain com.norvane.da is "
        "an "
        "integer of 0 to 2147483647, not an array"}},
      {R"({"TaskingID": "t", "TaskingPayload": [{"Domain": "d", "Key": "k", "Value": ["a\u0001"]}]})",
       {"TaskingPayload[0]: contains text that preferences cannot store: property lists contain no "
        "control characters and only UTF-8: give such bytes as data"}}};
  for (const auto& [document, findings] : cases) {
    std::string lines;
    for (const std::string& finding : findings)
      lines += "tavrelctl: standard input: " + finding + "\n";
    EXPECT_EQ(device.run("tasking schedule -", document), (Outcome{1, "", lines}));
  }
  const std::string none = device.path("/none"), folder = device.path("/");
  const std::string domain = "/var/mobile/Library/Preferences/com.norvane.Drovelink.plist";
  device.check("tasking schedule " + none,
               fails("cannot read " + none + ": No such file or directory"));
  device.check(
      "tasking schedule " + folder,
      fails("cannot read " + folder + ": it is a folder: give a file, or - for standard input"));
  EXPECT_TRUE(device.run("tasking show").out.starts_with("Scheduled tasking: none\n"));
  device.write(domain, "{}");
  for (const auto& unreadable : {"tasking show", "tasking show --json", "tasking clear"}) {
    device.check(unreadable,
                 fails("cannot read preferences " + device.path(domain) +
                       ": not a property list: it begins neither with \"bplist00\" nor with \"<\"; "
                       "repair it, or the next write sets it aside"));
  }
}

}  // namespace
}  // namespace tavrel
