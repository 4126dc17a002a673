#include "base/civil_time.h"
#include "device.h"
#include "platform/linux/store/kept_values.h"
#include "tests/helpers/killed_process.h"

namespace tavrel {
namespace {

namespace fs = std::filesystem;

const std::string kSwitch = "com.norvane.zentrix DiagnosticSubmissionEnabled";

struct Consent : DeviceTest {
  Consent() {
    today = device.json("status")["today"]["day"];
    device.write(kWhitelistFile, "<plist>");
  }

  std::string text(std::int32_t day) const {
    return format("%d (%s)", day, dateText(civilFromDays(day)));
  }
  std::string allowed(std::int32_t day) const { return "allowed from day " + text(day) + " on"; }
  void fileLogs(std::initializer_list<const char*> names) const {
    for (const char* name : names)
      device.fileLog(name, "text", "{}");
  }
  /// Visible logs, each of which must have its metadata.
  std::size_t visibleLogs() const {
    std::size_t count = 0;
    for (const char* place : {"pending", "outbox"}) {
      const std::string folder = device.path(kSubmission + place);
      if (!fs::exists(folder)) continue;
      for (const auto& entry : fs::directory_iterator(folder)) {
        if (entry.path().extension() != ".log") continue;
        ++count;
        EXPECT_TRUE(fs::exists(fs::path(entry.path()).replace_extension(".metadata.plist")));
      }
    }
    return count;
  }
  bool holds(std::string_view marker) const {
    for (const auto& [path, content] : device.files())
      if (content.find(marker) != std::string::npos) return true;
    return false;
  }

  std::int32_t today = 0;
};

TEST_F(Consent, BeginsAfterAllThatIsRecorded) {
  device.run("stat import", "scalar\t20000\tk\t1\n");
  device.check("allow", prints("submission is " + allowed(today + 1) + "\n"));
  device.check("allow", prints("submission is already " + allowed(today + 1) + "\n"));
  device.check(format("allow --from %d", today + 9),
               fails("submission is already " + allowed(today + 1) +
                     ": a later day needs 'tavrelctl deny' first"));
  const auto status = device.json("status");
  EXPECT_EQ(status["submission_allowed"], true);
  EXPECT_EQ(status["submission_first_day"]["day"], today + 1);
  expectIn(device.run("status").out,
           {"no log for day " + text(today - 1) + ": submission is " + allowed(today + 1)});
  device.check(
      "allow --from yesterday",
      {0, "submission is " + allowed(today - 1) + "\n",
       "tavrelctl: this includes what is already recorded, from day " + text(today - 1) + " on\n"});

  // A clock that is behind the recorded statistics.
  device.run("deny");
  device.run("stat import", format("scalar\t%d\tk\t1\n", today + 5));
  expectIn(device.run("allow --json").error, {"submission begins after it"});
  device.check("allow", {0, "submission is already " + allowed(today + 6) + "\n",
                         "tavrelctl: today is " + text(today) +
                             ": 'tavrelctl allow --from DAY' names an earlier day\n"});
  expectIn(device.run("status --check").out,
           {"WARNING permission: the daily log may leave the device, from day " + text(today + 6) +
            " on: 'tavrelctl allow --from DAY' names an earlier day\n"});
  fs::remove(device.path(kWhitelistFile));
  expectIn(device.run("allow --from today").error,
           {"tavrelctl: no log is made yet: cannot read " + device.path(kWhitelistFile) +
            ": No such file or directory: write a whitelist, as tavrel(8) describes it\n"});
  device.run("deny");
  ASSERT_TRUE(KeptValues(device.path(kStore)).add({{0, today + 7, 1, "k"}}));
  EXPECT_EQ(device.json("allow")["submission_first_day"]["day"], today + 8);
  EXPECT_EQ(device.run("allow --from=-1").status, 2);
  device.run("deny");
  ASSERT_TRUE(KeptValues(device.path(kStore)).add({{0, 2147483646, 1, "k"}}));
  device.check("allow",
               fails("no day is later than what is recorded: erase that, or give --from DAY", 1));
  device.check("allow --from 2147483647",
               fails("day 2147483647 never comes: give at most 2147483646", 2));
  device.check(
      "allow --from soon",
      fails("not a day: soon: give today, yesterday, a 32-bit day number or YYYY-MM-DD", 2));
  device.write("/var/mobile/Library/Preferences/com.norvane.zentrix.plist", "damaged");
  EXPECT_EQ(device.run("allow").status, 1);
  EXPECT_EQ(device.run("deny").status, 0);
  EXPECT_EQ(device.json("prefs get " + kSwitch)["value"], false);
}

TEST_F(Consent, ASwitchSetByHandLosesTheDay) {
  device.run("allow");
  device.run("prefs set " + kSwitch + " true --bool");
  EXPECT_EQ(device.json("status")["submission_first_day"]["day"], today + 1) << "nothing changed";
  device.run("prefs set " + kSwitch + " false --bool");
  fileLogs({"pending/log-tallied-1"});
  expectIn(device.run("allow").error, {"1 waiting log of an earlier permission deleted"});
  device.run("prefs delete " + kSwitch);
  device.run("prefs set " + kSwitch + " true --bool");
  EXPECT_EQ(device.json("status")["submission_first_day"], nullptr);
  device.check("allow", prints("submission is already allowed\n"));
  for (const auto& [key, value, wrong, right] :
       {std::array{kSwitch.c_str(), "yes", "a boolean, not \"yes\"", ""},
        {"com.norvane.NANDInfo userWAmp", "3 --int", "a real above 0 and below 10, not 3",
         "2.5 --float"},
        {"com.norvane.NANDInfo userWAmp", "10 --float", "a real above 0 and below 10, not 10.0",
         "2.5 --float"},
        {"com.norvane.da Radio", "no", "a boolean, not \"no\"", "true|false --bool"},
        {"com.norvane.zentrix com.norvane.x", "1 --int", "a boolean, not 1", "true|false --bool"},
        {"com.norvane.zentrix DiagnosticSubmissionFirstDay", "2147483647 --int",
         "an integer of 0 to 2147483646, not 2147483647", ""},
        {"com.norvane.da AggressiveSubmissionDays", "-1 --int",
         "an integer of 0 to 2147483647, not -1", "3 --int"}}) {
    const std::string name = key;
    const std::size_t space = name.find(' ');
    const std::string set = "prefs set " + name + " " + value;
    device.check(
        set, fails("preference " + name.substr(space + 1) + " of domain " + name.substr(0, space) +
                       " is " + wrong + ": " +
                       (*right == 0 ? std::string("use 'tavrelctl allow' or 'tavrelctl deny'")
                                    : "give 'tavrelctl prefs set " + name + " " + right + "'") +
                       ", or store it anyway with --force",
                   2));
    EXPECT_EQ(device.run(set + " --force").status, 0);
  }
}

TEST_F(Consent, DeniesWhereverItIsKilled) {
  std::size_t kills = 0;
  for (std::size_t calls = 0;; calls += 3, ++kills) {
    device.run("allow");
    fileLogs({"pending/a", "pending/b", "outbox/a", "outbox/c"});
    if (!runUntilSystemCall(calls, [&] { device.run("deny"); })) break;
    const std::size_t left = visibleLogs();
    EXPECT_TRUE(left == 4 || device.json("status")["submission_allowed"] == false) << calls;
    device.run("deny");
    EXPECT_EQ(visibleLogs(), 0U);
  }
  EXPECT_GT(kills, 10U);
  device.check("deny", prints("submission is not allowed; 0 waiting logs deleted\n"));
}

TEST_F(Consent, ShowsWhatIsWithheld) {
  fileLogs({"withheld/StorageStatus-1"});
  expectIn(device.run("status").out, {"Withheld logs    1, never sent\n"});
  EXPECT_EQ(device.json("log list")["logs"][0]["place"], "withheld");
  fileLogs({"refused/StorageStatus-2"});
  expectIn(device.run("status").out, {"Refused logs     1, refused by the server\n"});
  EXPECT_EQ(device.json("log list")["logs"][1]["place"], "refused");
  expectIn(device.run("log show StorageStatus-2").out, {"refused/StorageStatus-2.log (refused)\n"});
  EXPECT_EQ(device.json("log show StorageStatus-1")["log"]["text"], "text");
}

TEST_F(Consent, ShowsOtherUsersTheLogsThatTheyMaySee) {
  if (geteuid() != 0) GTEST_SKIP() << "only root can become another user";
  fileLogs({"outbox/log-tallied-1", "outbox/StorageStatus-2", "refused/StorageStatus-3"});
  fs::permissions(device.path(""), fs::perms{0755});
  const std::string refused = device.path(kSubmission + "refused");
  fs::permissions(refused, fs::perms{0700});
  const auto run = [this](const char* command) { return device.runAsAnother(command); };
  const auto unlisted = [this](const char* place) {
    return "tavrelctl: cannot list " + device.path(kSubmission + place) +
           ": Permission denied; run as root or as the owner of the files";
  };
  const std::string unseen = unlisted("refused");
  const std::tuple<const char*, int, const char*> kCases[] = {
      {"status", 0, "\nRefused logs     unreadable\n"},
      {"log list", 1, " outbox  StorageStatus-2.log\n"},
      {"log show latest", 1, "outbox/log-tallied-1.log is damaged"},
      {"log show StorageStatus-2", 0, "outbox/StorageStatus-2.log (outbox)\n"},
      {"nandlog show", 1, "outbox/StorageStatus-2.log"}};
  for (const auto& [command, status, shown] : kCases) {
    const Outcome outcome = run(command);
    EXPECT_EQ(outcome.status, status) << outcome;
    expectIn(outcome.out + outcome.error, {shown});
    EXPECT_EQ(outcome.error.find(unseen) == 0, status != 0) << outcome;
  }
  fs::remove(device.path(kSubmission + "outbox/log-tallied-1.log"));
  EXPECT_EQ(run("log show latest"), fails(unseen.substr(11)));
  fileLogs({"withheld/StorageStatus-4"});
  fs::permissions(device.path(kSubmission + "withheld"), fs::perms{0700});
  const std::string both = unlisted("withheld") + "\n" + unseen + "\n";
  for (const char* command : {"log list", "log show StorageSt", "nandlog show"})
    EXPECT_EQ(run(command).error.substr(0, both.size()), both) << command;
  EXPECT_EQ(run("log show StorageSt").error, both);
  EXPECT_EQ(run("log show StorageStatus-2").error, "");
  const fs::path before = fs::current_path();
  fs::current_path(device.path(""));
  device.write("/plain", "a text\n");  // a file of the working folder needs no log folder
  const Outcome plain = run("log show plain");
  fs::current_path(before);
  EXPECT_EQ(plain.error, "");
  EXPECT_EQ(
      run("log show StorageStatus-4").error,
      both + "tavrelctl: no log or file StorageStatus-4: 'tavrelctl log list' shows the logs\n");
}

TEST_F(Consent, ErasesWhereverItIsKilled) {
  std::string rows;
  for (int i = 0; i < 1500; ++i) {
    rows += format("scalar\t%d\tapp.gone%d\t1\nscalar\t%d\tapp.kept%d\t1\n", i % 3, i, i % 3, i);
    rows += format("value\t%d\tapp.gone\t5\t-1.5\nvalue\t%d\tapp.kept\t5\t2.5\n", i % 3, i % 3);
  }
  std::size_t kills = 0;
  for (std::size_t calls = 100;; calls += 97, ++kills) {
    fs::remove_all(device.path("/var/mobile/Library/Brimhold"));
    device.run("stat import", rows);
    const std::string before = device.run("stat export app.kept").out;
    const bool killed =
        runUntilSystemCall(calls, [&] { device.run("erase --key app.gone --yes"); });
    const Outcome again = device.run("erase --key app.gone --yes");
    EXPECT_EQ(again.status, 0) << again;
    EXPECT_EQ(device.run("stat export").out, before) << calls;
    EXPECT_FALSE(holds("app.gone")) << calls;
    EXPECT_FALSE(holds(std::string("\0\0\0\0\0\0\xF8\xBF", 8))) << "-1.5 at " << calls;
    EXPECT_EQ(fs::file_size(device.path(kStore + "-wal")), 0U);
    if (!killed) break;
  }
  EXPECT_GT(kills, 3U);
}

TEST_F(Consent, ErasesDaysOrAll) {
  device.run("stat import", "scalar\t20000\ta\t1\nscalar\t20001\ta\t1\nvalue\t20001\tb\t5\t0.5\n");
  device.run("stat import", "scalar\t20002\tc\t1\n");
  const std::string records = "/var/mobile/Library/Logs/CrashReporter/StructuredData/176-2024-10-0";
  for (const char* day : {"4.jsonl", "5.jsonl", "6.jsonl"})
    device.write(records + day, "");
  fileLogs({"pending/a", "outbox/a", "withheld/b", "refused/c"});
  for (const char* damaged : {".corrupt-X", "-kept-damaged"})
    device.write(kStore + damaged, "x");
  const std::string halfWritten = "/var/mobile/Library/Brimhold/.tavrel-1.tmp";
  const std::string metrics = "/run/tavrel/metrics/tavrel.prom";
  for (const std::string& path : {halfWritten, metrics})
    device.write(path, "x");
  device.check("erase --key a", fails("not a terminal: add --yes to erase without asking", 2));
  for (const std::string answer : {"y\n", "yes\n"}) {
    std::istringstream in(answer);
    std::ostringstream out, error;
    ToolStreams streams{in, out, error};
    streams.inIsTerminal = streams.errorIsTerminal = true;
    const int status = runTavrelctl({"--root", device.path(""), "erase", "--key", "c"}, streams);
    EXPECT_EQ(status, answer == "yes\n" ? 0 : 1);
    EXPECT_TRUE(error.str().starts_with("Erase the statistics whose keys begin with c below " +
                                        device.path("/") + "? Type yes: "));
  }
  device.check("erase --yes",
               fails("name what to erase: --all, or --key PREFIX, --from DAY and --to DAY", 2));
  for (const char* more : {" --key a", " --from 1 --to 2"}) {
    device.check(std::string("erase --yes --all") + more,
                 fails("--all erases everything: leave --key, --from and --to out", 2));
  }
  device.check("erase --yes --from 5 --to 4",
               fails("no days: 5 (1970-01-06) is after 4 (1970-01-05)", 2));
  device.check("erase --yes --from 20001 --to 20001",
               {0, "erased: 1 scalar, 1 distribution of 1 value, 1 file of records\n",
                "tavrelctl: 2 waiting logs may report what was erased: 'tavrelctl deny' deletes "
                "what waits, and withdraws the permission\n"});
  EXPECT_FALSE(fs::exists(device.path(halfWritten)));
  EXPECT_TRUE(fs::exists(device.path(metrics)));
  EXPECT_TRUE(fs::exists(device.path(records + "4.jsonl")));
  EXPECT_TRUE(fs::exists(device.path(records + "6.jsonl")));
  device.check("erase --yes --all", prints("erased: 1 scalar, 0 distributions of 0 values, 2 files "
                                           "of records, 3 logs, 2 damaged files\n"));
  for (const auto& [path, content] : device.files())
    EXPECT_TRUE(path.find(".log") == std::string::npos && path.find("-kept") == std::string::npos &&
                path.find("corrupt") == std::string::npos &&
                path.find(".prom") == std::string::npos)
        << path;
  device.check("stat list", prints("no statistics\n"));
  device.check("erase --yes --all", prints("nothing to erase\n"));
}

}  // namespace
}  // namespace tavrel
