#include <CLI/CLI.hpp>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <sstream>
#include <stdlib.h>

#include "platform/linux/linux_platform.h"
#include "platform/platform.h"
#include "tools/tasking_commands.h"

namespace tavrel {
namespace {

constexpr std::string_view kApplied = "com.norvane.tallied.tavrel";

class TaskingTest : public testing::Test {
 protected:
  void SetUp() override {
    root = testing::TempDir() + "tavrel-tasking-XXXXXX";
    ASSERT_NE(mkdtemp(root.data()), nullptr);
    std::filesystem::create_directories(root + "/etc/tavrel");
    std::ofstream(root + "/etc/tavrel/system-version.plist")
        << "<plist version=\"1.0\"><dict><key>ProductBuildVersion</key><string>B1</string></dict>"
           "</plist>";
  }
  void TearDown() override { std::filesystem::remove_all(root); }

  /// Runs one command line as a process of its own would; yields its exit status.
  int run(std::vector<std::string> arguments, const std::string& input = {}) {
    std::istringstream in(input);
    std::ostringstream outStream;
    std::ostringstream errorStream;
    ToolContext context({in, outStream, errorStream});
    context.setRoot(root);
    CLI::App app;
    addTaskingCommands(app, context);
    app.parse(std::vector<std::string>(arguments.rbegin(), arguments.rend()));
    out = outStream.str();
    error = errorStream.str();
    return context.exitStatus();
  }

  std::string root;
  std::string out;
  std::string error;
};

TEST_F(TaskingTest, SchedulesShowsAndClears) {
  EXPECT_EQ(run({"tasking", "show"}), kExitSuccess);
  EXPECT_EQ(out,
            "Scheduled tasking: none\nApplied tasking: none\nLast OS update: none seen\n"
            "The next daily run changes nothing.\n");
  EXPECT_EQ(run({"tasking", "clear"}), kExitSuccess);
  EXPECT_EQ(out, "No tasking is scheduled.\n");

  EXPECT_EQ(run({"tasking", "schedule", "-"},
                R"({"TaskingID": "t1", "TaskingDigest": 7, "TaskingPayload": [
                  {"Domain": "com.norvane.da", "Key": "AggressiveSubmissionDays", "Value": 3},
                  {"Domain": "d", "Key": "k", "Value": "x\n"}]})"),
            kExitSuccess)
      << error;
  EXPECT_EQ(out,
            "Scheduled tasking t1 with 2 settings. The next daily run applies the scheduled "
            "tasking.\n");

  {
    LinuxPlatform device{DeviceRoot(root)};
    Preferences& preferences = device.platform().preferences;
    preferences.ZTXPreferencesSetValue("TaskingID", "t1", kApplied);
    preferences.ZTXPreferencesSetValue("TaskingOS", "B1", kApplied);
    preferences.ZTXPreferencesSetValue(
        "LastOSUpdate", plist::Dictionary{{"version", "B1"}, {"day", 20000}}, kApplied);
  }
  EXPECT_EQ(run({"tasking", "show"}), kExitSuccess);
  EXPECT_EQ(out,
            "Scheduled tasking: t1\n  digest: 7\n  settings: 2\n"
            "    DOMAIN          KEY                       VALUE\n"
            "    com.norvane.da  AggressiveSubmissionDays  3\n"
            "    d               k                         \"x\\n\"\n"
            "Applied tasking: t1\n  OS build: B1\n  digest: -\n  settings: none\n"
            "Last OS update: B1, first seen on day 20000\n"
            "The next daily run changes nothing.\n");

  EXPECT_EQ(run({"tasking", "schedule", "-"}, R"({"TaskingID": "t2"})"), kExitSuccess);
  EXPECT_EQ(run({"tasking", "show", "--json"}), kExitSuccess);
  EXPECT_EQ(Json::parse(out), Json::parse(R"({"format_version": 1,
    "scheduled": {"TaskingID": "t2", "TaskingDigest": null, "TaskingPayload": null},
    "applied": {"TaskingID": "t1", "TaskingOS": "B1", "TaskingDigest": null,
                "TaskingPayload": null},
    "LastOSUpdate": {"day": 20000, "version": "B1"},
    "next_run": "takes the applied tasking back and applies the scheduled one"})"));
  EXPECT_EQ(run({"tasking", "clear"}), kExitSuccess);
  EXPECT_EQ(out, "Removed scheduled tasking t2. Settings that were applied stay in force.\n");
  EXPECT_EQ(run({"tasking", "show"}), kExitSuccess);
  EXPECT_EQ(out.substr(0, out.find('\n')), "Scheduled tasking: none");
}

TEST_F(TaskingTest, RefusesWhatADeviceWouldNotApplyAsWritten) {
  struct Case {
    const char* document;
    std::vector<std::string> findings;
  };
  const Case cases[] = {
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
  };
  for (const Case& row : cases) {
    EXPECT_EQ(run({"tasking", "schedule", "-"}, row.document), kExitFailure) << row.document;
    std::string lines;
    for (const std::string& finding : row.findings) {
      lines += "tavrelctl: standard input: " + finding + "\n";
    }
    EXPECT_EQ(error, lines) << row.document;
    EXPECT_EQ(out, "");
  }
  EXPECT_EQ(run({"tasking", "schedule", root + "/none"}), kExitFailure);
  EXPECT_NE(error.find(root + "/none: No such file or directory"), std::string::npos) << error;
  EXPECT_EQ(run({"tasking", "show"}), kExitSuccess);
  EXPECT_EQ(out.substr(0, out.find('\n')), "Scheduled tasking: none");
}

}  // namespace
}  // namespace tavrel
