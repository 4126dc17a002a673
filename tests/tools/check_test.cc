// tavrelctl status --check
#include <chrono>
#include <grp.h>
#include <unistd.h>

#include "base/iso_date.h"
#include "device.h"
#include "platform/linux/runs/last_run.h"
#include "platform/plist/binary.h"
#include "tools/check/read_only.h"

namespace tavrel {
namespace {

constexpr double kHour = 3600, kDay = 86'400;

plist::Date ago(double seconds) {
  const std::chrono::duration<double> now = std::chrono::system_clock::now().time_since_epoch();
  return plist::Date::since1970(now.count() - seconds);
}

std::string isoAgo(double seconds) {
  return isoDateText(plist::Date::sinceEpoch(std::floor(ago(seconds).secondsSinceEpoch())));
}

struct CheckTest : DeviceTest {
  CheckTest() { writeRun(kHour, true); }

  /// Expects the line of one check, without the times in its text.
  void expect(const std::string& line, int status) const {
    const Outcome outcome = device.run("status --check");
    EXPECT_EQ(outcome.status, status) << outcome;
    expectIn("\n" + outcome.out, {"\n" + line});
  }

  void writeRun(double finishedAgo, bool isFinished, int errors = 0) const {
    FileSystem files;
    LastRun run;
    run.began = ago(kHour * 5);
    run.kind = RunKind::Daily;
    run.day = 20000;
    run.isFinished = isFinished;
    run.lastFinished = ago(finishedAgo);
    for (int i = 0; i < errors; ++i)
      run.addError("cannot do " + std::to_string(i));
    ASSERT_TRUE(run.write(device.root, files));
  }
};

TEST_F(CheckTest, HasALineForEachThingAndTheGravestStateAsStatus) {
  device.check("status --check",
               prints("OK permission: the daily log may not leave the device\n"
                      "OK clock: today is day " +
                      std::to_string(today()) + " (" + isoAgo(0).substr(0, 10) +
                      ")\n"
                      "OK last-run: the daily run of day 20000 (2024-10-04) finished, begun 5 h "
                      "ago\n"
                      "OK last-log: the next run: no log for day " +
                      std::to_string(today() - 1) + " (" + isoAgo(kDay).substr(0, 10) +
                      "): no permission for that day\n"
                      "OK store: none yet\n"
                      "OK limits: nothing removed early since yesterday\n"
                      "OK lost-values: none since yesterday\n"
                      "OK folding: no program records in memory\n"
                      "OK queue pending: empty\n"
                      "OK queue outbox: empty\n"
                      "OK queue withheld: empty\n"
                      "OK queue refused: empty\n"
                      "OK upload: no attempt yet\n"
                      "OK disk: no drive reports its health\n"));
  const auto json = device.json("status --check");
  EXPECT_EQ(json["state"], "ok");
  EXPECT_EQ(json["checks"][2]["figures"]["errors"], 0);
  EXPECT_EQ(device.runAt(device.path("/none"), "status --check").status, 3);
}

TEST_F(CheckTest, OutputThatCannotBePrintedHidesNoFinding) {
  device.write("/w.plist", xmlOf("{}"));
  const auto statusOf = [&](CommandLine command) {
    std::istringstream in;
    std::ostringstream error;
    std::ostream out(nullptr);
    command.insert(command.begin(), {"--root", device.path("")});
    const int status = runTavrelctl(command, {.in = in, .out = out, .error = error});
    EXPECT_EQ(error.str(),
              "tavrelctl: cannot write standard output: free space or check the pipe\n");
    return status;
  };
  const std::string file = device.path("/w.plist");
  EXPECT_EQ(statusOf("log list"), 1);
  EXPECT_EQ(statusOf("whitelist diff " + file + " " + file), 2);
  EXPECT_EQ(statusOf("whitelist check " + file), 2);
  EXPECT_EQ(statusOf("status --check"), 3);
  device.writeDrive("nvme0", "nvme", R"("critical_warning": 1)", isoAgo(kHour));
  EXPECT_EQ(statusOf("status --check"), 2);
  EXPECT_EQ(statusOf("disks"), 8 | 1);
}

TEST_F(CheckTest, TellsHowTheLastRunsWent) {
  const std::string run = "last-run: the daily run of day 20000 (2024-10-04)";
  std::filesystem::remove(device.path(kLastRunFile));
  expect("UNKNOWN last-run: no run yet", 3);
  writeRun(kHour, false);
  expect("WARNING " + run +
             ", begun 5 h ago, was killed before its end; the last one to finish a "
             "day ended 60 min ago\n",
         1);
  writeRun(2 * kDay - 60, true);
  expect("OK " + run + " finished", 0);
  writeRun(2 * kDay + 60, true);
  expect("WARNING " + run + " finished", 1);
  writeRun(7 * kDay + 60, true);
  expect("CRITICAL " + run + " finished", 2);
  writeRun(kHour, true, 2);
  expect("WARNING " + run + " finished, begun 5 h ago; 2 errors: cannot do 0; cannot do 1\n", 1);
  const auto before1970 = plist::Date::since1970(-0.5);
  const plist::Dictionary old{
      {"Time", before1970}, {"LastFinished", before1970}, {"Finished", true}};
  device.write(kLastRunFile, *plist::writeBinary(old));
  EXPECT_EQ(
      device.json("status --check", {}, 2)["checks"][2]["figures"]["finished_timestamp_seconds"],
      -1);
  expect("CRITICAL last-run: a run, which began no day's tasks, finished, begun ", 2);
}

TEST_F(CheckTest, JudgesPreferencesAndTheClock) {
  device.write(kWhitelistFile, "<plist>");
  expect("WARNING last-log: the next run: no log for day " + std::to_string(today() - 1) + " (" +
             isoAgo(kDay).substr(0, 10) + "): no permission for that day; " +
             device.path(kWhitelistFile) +
             ": XML property list, line 1, column 8: no element found: repair it, or replace it "
             "with another whitelist\n",
         1);
  std::filesystem::remove(device.path(kWhitelistFile));
  device.write("/var/mobile/Library/Preferences/com.norvane.zentrix.plist", "");
  device.run("prefs set com.norvane.zentrix com.norvane.zentrix.tallied.tavrel true --bool");
  expect(
      "WARNING permission: the daily log may not leave the device; a permission may have been "
      "lost, because the preferences of com.norvane.zentrix were damaged and set aside: ask the "
      "owner, then run 'tavrelctl allow' or 'tavrelctl deny'\n",
      1);
  device.run("deny");
  expect("OK permission: the daily log may not leave the device\n", 0);
  device.run("prefs set com.norvane.zentrix DiagnosticSubmissionEnabled true --force");
  expect("WARNING permission: DiagnosticSubmissionEnabled is a string, which counts as no", 1);
  device.run("prefs set com.norvane.zentrix DiagnosticSubmissionEnabled true --bool");
  expect("OK permission: the daily log may leave the device\n", 1);
  for (const char* junk : {"", "<plist>"}) {  // no whitelist, then an unusable one
    if (*junk != 0) device.write(kWhitelistFile, junk);
    expect("WARNING last-log: the next run: no log for day", 1);
  }
  device.run("prefs set com.norvane.zentrix DiagnosticSubmissionFirstDay 1.5 --float --force");
  expect(
      "WARNING permission: held back: DiagnosticSubmissionFirstDay is not a day: run 'tavrelctl "
      "allow'\n",
      1);
  EXPECT_EQ(device.json("status --check", {}, 1)["checks"][0]["figures"]["allowed"], 0);
  const auto status = device.json("status");
  EXPECT_EQ(status["submission_allowed"], false);
  EXPECT_EQ(status["submission_first_day"], nullptr);
  device.run({"prefs", "set", "com.norvane.zentrix", "DiagnosticSubmissionFirstDay", "--int",
              std::to_string(today() + 1)});
  expect("OK permission: the daily log may leave the device, from day", 1);
  device.run({"prefs", "set", "com.norvane.tallied.tavrel", "--int",
              "LastCrashLogSerializationDateInDaysSince1970", std::to_string(today())});
  expect("WARNING clock: today is day", 1);
  device.run({"prefs", "set", "com.norvane.tallied.tavrel", "--int",
              "LastCrashLogSerializationDateInDaysSince1970", std::to_string(today() + 2)});
  expect("CRITICAL clock: today is day", 2);
}

TEST_F(CheckTest, JudgesTheLastLog) {
  device.write(kWhitelistFile, xmlOf("{}"));
  device.run("prefs set com.norvane.zentrix DiagnosticSubmissionEnabled true --bool");
  const std::string own = "prefs set com.norvane.tallied.tavrel ";
  device.run(own + "LastCrashLogSerializationDateInDaysSince1970 20001 --int");
  const std::string day = " log for day 20001 (2024-10-05)";
  for (const auto& [outcome, line, status] :
       {std::tuple("filed", "OK last-log: the last daily run: a" + day + "\n", 0),
        {"filed-in-part",
         "WARNING last-log: the last daily run: a" + day +
             " without statistics that could not be read; see the system log\n",
         1},
        {"nothing-to-report",
         "WARNING last-log: the last daily run: no" + day +
             ": no value found for any whitelisted key\n",
         1},
        {"store-unreadable",
         "CRITICAL last-log: the last daily run: no" + day +
             ": not all statistics could be read; see the system log\n",
         2},
        {"not-filed",
         "CRITICAL last-log: the last daily run: no" + day +
             ": filing failed; see the system log\n",
         2}}) {
    device.run(own + "LastLogOutcome " + outcome);
    expect(line, status);
  }
}

TEST_F(CheckTest, FindsDamageOfTheStoreAndWhatStandsBesideIt) {
  std::string values;
  for (int i = 0; i < 3000; ++i)
    values += "scalar\t20000\tcom.example.key." + std::to_string(i) + "\t1\n";
  device.run("stat import -", values);
  expect("OK store: ", 0);
  EXPECT_GT(device.json("status --check")["checks"][4]["figures"]["free_bytes"], 0);
  device.write(kStore + ".corrupt-1", "");
  device.write(kStore + "-kept", "");
  expect("WARNING store: ", 1);
  expectIn(device.run("status --check").out, {"; no damage; 1 damaged store set aside in "});
  device.write("/etc/tavrel/limits.plist", "garbage");
  expect("WARNING limits: nothing removed early since yesterday; " +
             device.path("/etc/tavrel/limits.plist"),
         1);
  std::filesystem::remove(device.path("/etc/tavrel/limits.plist"));
  const char* const failures = "/var/lib/tavrel/tidy-failures";
  device.write(failures, "no room\nnor time\n");
  std::filesystem::last_write_time(
      device.path(failures), std::filesystem::file_time_type::clock::now() - std::chrono::hours(3));
  expect(
      "WARNING limits: nothing removed early since yesterday; 'tavrelctl tidy' failed 3 h ago: no "
      "room\n",
      1);
  std::string bytes = contentOf(device.path(kStore)) + contentOf(device.path(kStore + "-wal"));
  ASSERT_GT(bytes.size(), 100'000U);
  std::filesystem::remove(device.path(kStore + "-wal"));
  std::filesystem::remove(device.path(kStore + "-shm"));
  bytes.resize(100'000, 'x');
  device.write(kStore, "SQLite format 3" + bytes);
  expect("CRITICAL store: ", 2);
}

TEST(CheckReadOnly, IsOfTheFileSystemNotOfTheMount) {
  constexpr const char* kMounts =
      "31 1 8:2 / / ro,relatime shared:1 - ext4 /dev/sda2 rw,errors=remount-ro\n"
      "32 31 8:3 / /var rw,relatime - ext4 /dev/sda3 ro,errors=remount-ro\n"
      "33 31 0:9 / /run rw - tmpfs ro ro\n"
      "34 31 8:4 / /home rw,relatime - ext4 /dev/sda4 rw,errors=remount-ro,emergency_ro\n"
      "35 31 8:5 / /srv rw - ext4 /dev/sda5 rw,emergency_ro,errors=remount-ro\n"
      "36 31 0:10 / /opt ro,emergency_ro - x ro rw,ro_x,x_ro";
  for (const auto& [mount, isReadOnly] : {std::pair(31U, false),
                                          {32U, true},
                                          {33U, true},
                                          {34U, true},
                                          {35U, true},
                                          {36U, false},
                                          {3U, false}})
    EXPECT_EQ(isReadOnlyIn(kMounts, mount), isReadOnly) << mount;
}

TEST_F(CheckTest, JudgesQueuesByTheirOldestLog) {
  for (const auto& [place, age, line, status] :
       {std::tuple("pending", 3 * kHour, "OK queue pending: 1 log, the oldest filed 3 h ago\n", 0),
        {"pending", 50 * kHour, "WARNING queue pending: 2 logs, the oldest filed 2 days ago\n", 1},
        {"outbox", 8 * kDay, "CRITICAL queue outbox: 1 log, the oldest filed 8 days ago\n", 2},
        {"withheld", 900 * kDay, "OK queue withheld: 1 log, the oldest filed 900 days ago\n", 2},
        {"refused", kHour, "WARNING queue refused: 1 log, the oldest filed 60 min ago\n", 2}}) {
    std::string filed = isoAgo(age);
    std::erase_if(filed, [](char c) { return c == '-' || c == ':'; });
    device.fileLog(format("%s/log-tallied-%s-0011aabb", std::string(place), filed), "", "{}");
    expect(line, status);
  }
}

TEST_F(CheckTest, TellsFailuresOfUploadsLimitsAndLosses) {
  const auto state = [&](double success, int failed) {
    device.write(
        "/var/lib/tavrel/upload/state.plist",
        xmlOf(R"({"LastSuccess": {"$date": ")" + isoAgo(success) +
              R"("}, "Failure": "no route", "FailedAttempts": )" + std::to_string(failed) + "}"));
  };
  state(30 * kDay, 0);
  expect("OK upload: a log was last sent 30 days ago\n", 0);
  state(kHour, 4);
  expect("OK upload: a log was last sent 60 min ago; 4 attempts failed since: no route\n", 0);
  state(8 * kDay, 4);
  expect("CRITICAL upload: ", 2);
  device.write("/var/lib/tavrel/upload/state.plist", xmlOf(R"({"FailedAttempts": 1})"));
  expect("WARNING upload: never sent; 1 attempt failed, the last with: reason unknown\n", 1);
  device.run("stat import -",
             "scalar\tyesterday\tcom.norvane.tavrel.limits.store.days\t4\n"
             "scalar\tyesterday\tcom.norvane.tavrel.limits.store.early_days\t3\n"
             "scalar\ttoday\tcom.norvane.brimhold.dropped\t0\n"
             "scalar\t20000\tcom.norvane.brimhold.dropped\t7\n");
  expect("WARNING limits: since yesterday: store.early_days 3\n", 1);
  expect("OK lost-values: none since yesterday\n", 1);
  device.run("stat import -", "scalar\ttoday\tcom.norvane.brimhold.dropped\t9\n");
  expect("WARNING lost-values: since yesterday: dropped 9\n", 1);
  device.write("/etc/tavrel/recorders.plist", "<plist>");
  expect("WARNING folding: no program records in memory; cannot read " +
             device.path("/etc/tavrel/recorders.plist") +
             ": XML property list, line 1, column 8: no element found; repair or remove it\n",
         1);
  device.write("/etc/tavrel/recorders.plist", xmlOf(R"({"nosuchuser": ["app."]})"));
  expect(
      "WARNING folding: no program records in memory; " +
          device.path("/etc/tavrel/recorders.plist") +
          ": the entry \"nosuchuser\" names no user of this machine: until it does, only root may "
          "record its keys\n",
      1);
}

TEST_F(CheckTest, JudgesNothingThatThisUserCannotSee) {
  if (geteuid() != 0) GTEST_SKIP() << "only root can become another user";
  device.run("stat import -", "scalar\ttoday\tcom.norvane.tavrel.limits.store.days\t3\n");
  std::filesystem::create_directories(device.path("/run/tavrel/stat"));
  std::filesystem::permissions(device.path(""), std::filesystem::perms{0755});
  EXPECT_EQ(inChild([this] {
              if (setgroups(0, nullptr) + setgid(65534) + setuid(65534) != 0) return 100;
              for (const char* name : {"store", "limits", "lost-values"})
                expect(std::string("UNKNOWN ") + name + ": ", 3);
              return HasFailure() ? 1 : 0;
            }),
            0);
}

TEST_F(CheckTest, ShowsTheVerdictOfEachDisk) {
  const std::tuple<const char*, const char*, int> kCases[] = {
      {R"("used_pct": 3)", "OK disk nvme0: good, read 3 h ago\n", 0},
      {R"("used_pct": 100)", "WARNING disk nvme0: worn, used_pct is 100, read 3 h ago\n", 1},
      {R"("critical_warning": 1)",
       "CRITICAL disk nvme0: failing, critical_warning is 1, read 3 h ago\n", 2}};
  for (const auto& [figures, line, status] : kCases) {
    device.writeDrive("nvme0", "nvme", figures, isoAgo(3 * kHour));
    expect(line, status);
  }
}

}  // namespace
}  // namespace tavrel
