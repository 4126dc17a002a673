// tavrelctl tasking
#include <nlohmann/json.hpp>

#include "device.h"
#include "platform/linux/linux_platform.h"

namespace tavrel {
namespace {

constexpr std::string_view kApplied = "com.norvane.tallied.tavrel";

struct TaskingTest : testing::Test {
  TaskingTest() {
    device.write("/etc/tavrel/system-version.plist", xmlOf(R"({"ProductBuildVersion": "B1"})"));
  }
  Outcome run(std::vector<std::string> arguments, const std::string& input = {}) {
    arguments.insert(arguments.begin(), "tasking");
    return device.run(std::move(arguments), input);
  }

  TemporaryDevice device;
};

TEST_F(TaskingTest, SchedulesShowsAndClears) {
  EXPECT_EQ(run({"show"}),
            prints("Scheduled tasking: none\nApplied tasking: none\nLast OS update: none seen\n"
                   "The next daily run changes nothing.\n"));
  EXPECT_EQ(run({"clear"}), prints("No tasking is scheduled.\n"));

  EXPECT_EQ(run({"schedule", "-"},
                R"({"TaskingID": "t1", "TaskingDigest": 7, "TaskingPayload": [
                  {"Domain": "com.norvane.da", "Key": "AggressiveSubmissionDays", "Value": 3},
                  {"Domain": "d", "Key": "k", "Value": "x\n"}]})"),
            prints("Scheduled tasking t1 with 2 settings. The next daily run applies the scheduled "
                   "tasking.\n"));

  {
    LinuxPlatform linuxPlatform{DeviceRoot(device.path(""))};
    Preferences& preferences = linuxPlatform.platform().preferences;
    preferences.ZTXPreferencesSetValue("TaskingID", "t1", kApplied);
    preferences.ZTXPreferencesSetValue("TaskingOS", "B1", kApplied);
    preferences.ZTXPreferencesSetValue(
        "LastOSUpdate", plist::Dictionary{{"version", "B1"}, {"day", 20000}}, kApplied);
  }
  EXPECT_EQ(run({"show"}),
            prints("Scheduled tasking: t1\n  digest: 7\n  settings: 2\n"
                   "    DOMAIN          KEY                       VALUE\n"
                   "    com.norvane.da  AggressiveSubmissionDays  3\n"
                   "    d               k                         \"x\\n\"\n"
                   "Applied tasking: t1\n  OS build: B1\n  digest: -\n  settings: none\n"
                   "Last OS update: B1, first seen on day 20000\n"
                   "The next daily run changes nothing.\n"));

  EXPECT_EQ(run({"schedule", "-"}, R"({"TaskingID": "t2"})").status, 0);
  EXPECT_EQ(Json::parse(run({"show", "--json"}).out), Json::parse(R"({"format_version": 1,
    "scheduled": {"TaskingID": "t2", "TaskingDigest": null, "TaskingPayload": null},
    "applied": {"TaskingID": "t1", "TaskingOS": "B1", "TaskingDigest": null,
                "TaskingPayload": null},
    "LastOSUpdate": {"day": 20000, "version": "B1"},
    "next_run": "takes the applied tasking back and applies the scheduled one"})"));
  EXPECT_EQ(run({"clear"}),
            prints("Removed scheduled tasking t2. Settings that were applied stay in force.\n"));
  EXPECT_TRUE(run({"show"}).out.starts_with("Scheduled tasking: none\n"));
}

TEST_F(TaskingTest, SaysWhatTheDaemonWouldDo) {
  const auto nextRun = [this](const std::string& tasking) {
    device.write("/var/mobile/Library/Preferences/com.norvane.Drovelink.plist",
                 xmlOf(R"({"ScheduledTasking": )" + tasking + "}"));
    return Json::parse(run({"show", "--json"}).out)["next_run"];
  };
  EXPECT_EQ(nextRun(R"({"TaskingID": 4})"), "changes nothing");
  EXPECT_EQ(nextRun(R"({"TaskingID": "t", "TaskingPayload": [], "TaskingDigest": ")" +
                    std::string(1U << 20, 'x') + "\"}"),
            "refuses the scheduled tasking, which preferences cannot hold");
}

TEST_F(TaskingTest, RefusesWhatADeviceWouldNotApplyAsWritten) {
  const std::pair<const char*, std::vector<std::string>> cases[] = {
      {"[1]", {"tasking: must be a dictionary, not an array"}},
      {R"({"TaskingId": "x"})",
       {"TaskingId: has no meaning; a device knows TaskingID, TaskingDigest, TaskingPayload",
        "TaskingID: is missing"}},
      {R"({"TaskingID": "", "TaskingPayload": {}})",
       {"TaskingID: must not be empty", "TaskingPayload: must be an array, not a dictionary"}},
      {R"({"TaskingID": 4, "TaskingPayload": [1, {"Domain": "../d", "Key": "k", "Value": 1},
          {"Key": "k", "value": 1}, {"Domain": "d", "Key": "k", "Value": 1},
          {"Domain": "d", "Key": "k", "Value": 2}]})",
       {"TaskingID: must be a string, not an integer",
        "TaskingPayload[0]: must be a dictionary, not an integer",
        "TaskingPayload[1]/Domain: is no name of a preference domain",
        "TaskingPayload[2]/value: has no meaning; a device knows Domain, Key, Value",
        "TaskingPayload[2]/Domain: is missing", "TaskingPayload[2]/Value: is missing",
        "TaskingPayload[4]: sets the same key as an earlier setting"}},
      {R"({"TaskingID": "t", "TaskingPayload": [{"Domain": "d", "Key": "k", "Value": ["a\u0001"]}]})",
       {"TaskingPayload[0]: holds text that no preference can: property lists hold no control "
        "characters and only UTF-8: give such bytes as data"}}};
  for (const auto& [document, findings] : cases) {
    std::string lines;
    for (const std::string& finding : findings)
      lines += "tavrelctl: standard input: " + finding + "\n";
    EXPECT_EQ(run({"schedule", "-"}, document), (Outcome{1, "", lines}));
  }
  const std::string none = device.path("/none");
  EXPECT_EQ(run({"schedule", none}), fails("cannot read " + none + ": No such file or directory"));
  EXPECT_TRUE(run({"show"}).out.starts_with("Scheduled tasking: none\n"));

  EXPECT_EQ(run({"schedule", device.path("/")}),
            fails("cannot read " + device.path("/") +
                  ": it is a folder: give a file, or - for standard input"));
  device.write("/var/mobile/Library/Preferences/com.norvane.Drovelink.plist", "{}");
  for (const std::vector<std::string>& unreadable :
       {std::vector<std::string>{"show"}, {"show", "--json"}, {"clear"}}) {
    EXPECT_EQ(run(unreadable),
              fails("cannot read preferences " +
                    device.path("/var/mobile/Library/Preferences/com.norvane.Drovelink.plist") +
                    ": not a property list: it begins neither with \"bplist00\" nor with \"<\"; "
                    "mend it, or the next write sets it aside"));
  }
}

}  // namespace
}  // namespace tavrel
