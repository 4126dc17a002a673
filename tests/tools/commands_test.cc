// tavrelctl as a whole: usage, preferences, property lists, logs, status.
#include "base/limits.h"
#include "base/version.h"
#include "device.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/store/sqlite_store.h"

namespace tavrel {
namespace {

TEST(Usage, MistakesEndWithStatus2AndOneLine) {
  const TemporaryDevice device;
  const std::string kNoXmlText =
      "cannot be stored: property lists allow only UTF-8 without control characters: give such "
      "bytes as --plist '{\"$data\": \"BASE64\"}'";
  const std::pair<CommandLine, std::string> kCases[] = {
      {"", "name a subcommand: see 'tavrelctl --help'"},
      {"frob x", "no subcommand 'frob': see 'tavrelctl --help'"},
      {"log --frob", "no option '--frob': see 'tavrelctl log --help'"},
      {"log frob", "no subcommand 'frob': see 'tavrelctl log --help'"},
      {"log", "name a subcommand: see 'tavrelctl log --help'"},
      {"--root", "--root needs a value: DIR: see 'tavrelctl --help'"},
      {"plist convert --to yaml x",
       "--to: not xml, binary or json: yaml: see 'tavrelctl plist convert --help'"},
      {"log list --limit 5", "no option '--limit': see 'tavrelctl log list --help'"},
      {"log list x", "unexpected argument 'x': see 'tavrelctl log list --help'"},
      {"prefs set d k -inf --float",
       "no option '-inf': put -- before it if it is a value: see 'tavrelctl prefs set --help'"},
      {"prefs set d k v -x", "no option '-x': see 'tavrelctl prefs set --help'"},
      {"log list -", "unexpected argument '-': see 'tavrelctl log list --help'"},
      {"log list -5", "no option '-5': see 'tavrelctl log list --help'"},
      {"log list -- -5", "unexpected argument '-5': see 'tavrelctl log list --help'"},
      {"prefs get a", "KEY is required: see 'tavrelctl prefs get --help'"},
      {"prefs get ../a k",
       "not a preference domain: ../a: give a name such as com.example.app, without slashes"},
      {"log preview --day soon",
       "not a day: soon: give today, yesterday, a 32-bit day number or YYYY-MM-DD"},
      {CommandLine{"prefs", "set", "a", "", "x"},
       "KEY: must not be empty: see 'tavrelctl prefs set --help'"},
      {CommandLine{"prefs", "get", "a", ""},
       "KEY: must not be empty: see 'tavrelctl prefs get --help'"},
      {"prefs set a k @ --plist", "no file after @: write @FILE"},
      {"prefs set a k x\x01", kNoXmlText},
      {"prefs set a k\xff x", kNoXmlText},
      {"prefs set a k [{\"\xEF\xBF\xBE\":1}] --plist", kNoXmlText},
      {"prefs set a k @1e300 --date",
       "cannot be stored: cannot encode the property list, value /: the date is beyond any "
       "calendar"},
      {"prefs set a k 1 --int --bool",
       "give at most one of --string, --bool, --int, --float, --date and --plist: see 'tavrelctl "
       "prefs set --help'"},
      {"log show --raw --json",
       "--raw and --json exclude each other: see 'tavrelctl log show --help'"},
      {CommandLine{"plist", "convert", "--to", "1 excludes 2", "x"},
       "--to: not xml, binary or json: 1 excludes 2: see 'tavrelctl plist convert --help'"},
      {CommandLine{"log", "preview", "--day", ""},
       "--day: must not be empty: see 'tavrelctl log preview --help'"},
      {"erase --key= --yes", "--key: must not be empty: see 'tavrelctl erase --help'"},
      {"completion man", "completion man needs FILE, the template of the page"},
      {CommandLine{"plist", "convert", ""},
       "FILE: must not be empty: see 'tavrelctl plist convert --help'"},
      {CommandLine{"whitelist", "diff", "", ""},
       "OLD: must not be empty: see 'tavrelctl whitelist diff --help'"},
      {CommandLine{"whitelist", "check", ""},
       "FILE: must not be empty: see 'tavrelctl whitelist check --help'"},
      {CommandLine{"whitelist", "explain", "a", ""},
       "KEY: must not be empty: see 'tavrelctl whitelist explain --help'"},
      {CommandLine{"stat", "show", ""}, "KEY: must not be empty: see 'tavrelctl stat show --help'"},
      {CommandLine{"catalogue", ""}, "KEY: must not be empty: see 'tavrelctl catalogue --help'"},
      {CommandLine{"registry", "record", ""},
       "FILE: must not be empty: see 'tavrelctl registry record --help'"},
      {CommandLine{"records", "list", "--type", ""},
       "--type: must not be empty: see 'tavrelctl records list --help'"},
      {"records list --type 0x10",
       "--type: give a number up to 4294967295, in decimal digits, not 0x10: see 'tavrelctl "
       "records list --help'"},
      {"stat collect --seconds -1",
       "--seconds: give a number up to 4294967295, in decimal digits, not -1: see 'tavrelctl stat "
       "collect --help'"}};
  for (const auto& [command, error] : kCases)
    device.check(command, fails(error, 2));
  const std::string none = device.path("/none");
  for (const auto& command : {"status", "stat set k 1"}) {
    EXPECT_EQ(device.runAt(none, command),
              fails("cannot use device root " + none +
                    "/: No such file or directory: name the device's folder with "
                    "TAVREL_ROOT or --root"));
  }
  for (const std::string command : {"registry record --live ", "stat collect --once --state "}) {
    device.check(command + none + "/x", fails("cannot write " + none + "/x: " + none +
                                              ": No such file or directory: create this folder"));
  }
  EXPECT_EQ(device.runAt("", "status"),
            fails("--root: names no folder: see 'tavrelctl status --help'", 2));
  EXPECT_FALSE(std::filesystem::exists(none));
  // The journal takes the priority of a line from its first characters.
  const std::pair<std::vector<std::string>, std::string> kJournal[] = {
      {{"prefs", "set", "a", "k", "true"},
       "<4>tavrelctl: stored as a string: true: use --bool for a boolean\n"},
      {{"prefs", "get", "a", "b"},
       "<3>tavrelctl: no preference b in domain a: 'tavrelctl prefs list a' shows what there "
       "is\n"}};
  for (const auto& [command, line] : kJournal) {
    std::istringstream in;
    std::ostringstream out, error;
    std::vector<std::string> words{"--root", device.path("")};
    words.insert(words.end(), command.begin(), command.end());
    runTavrelctl(words, {.in = in, .out = out, .error = error, .errorIsJournal = true});
    EXPECT_EQ(error.str(), line);
  }
  device.check("--version", prints(format("tavrelctl %s\n", version())));
  expectIn(device.run("prefs set --help").out,
           {"Usage: ", "\n\nKind of VALUE, at most one:\n  --string "});
  for (const auto& help : {"--help", "log --help"})
    expectIn(device.run(help).out, {"Usage: "});
}

TEST(Prefs, KeepTheKindThatWasAskedFor) {
  const TemporaryDevice device;
  const std::tuple<std::string, std::string, std::string, std::string> kCases[] = {
      {"--string", "a b", "a b\n", R"("a b")"},
      {"--bool", "yes", "true\n", "true"},
      {"--bool", "False", "false\n", "false"},
      {"--int", "-9223372036854775808", "-9223372036854775808\n", "-9223372036854775808"},
      {"--int", "18446744073709551615", "18446744073709551615\n", "18446744073709551615"},
      {"--float", "1e3", "1000.0\n", "1000.0"},
      {"--float", "-inf", "-inf\n", R"({"$real":"-inf"})"},
      {"--date", "2026-11-16", "2026-11-16 00:00:00 +0000\n",
       R"({"$date":"2026-11-16T00:00:00Z"})"},
      {"--plist", R"({"b": [1], "a": {"$data": "/w=="}})", "a = <ff>\nb:\n  [0] = 1\n",
       R"({"a":{"$data":"/w=="},"b":[1]})"}};
  for (const auto& [kind, text, shown, json] : kCases) {
    device.check({"prefs", "set", kind, "com.example.a", "key", "--", text}, prints(""));
    device.check("prefs get com.example.a key", prints(shown));
    EXPECT_EQ(device.json("prefs get com.example.a key")["value"].dump(), json);
  }
  device.check("prefs set com.example.a flag true",
               fails("stored as a string: true: use --bool for a boolean", 0));
  device.check("prefs set com.example.a n 1x --int",
               fails("not an integer: 1x: give a decimal number of at most 64 bits", 2));
  device.check("prefs list com.example.a", prints("KEY   TYPE        VALUE\n"
                                                  "flag  string      \"true\"\n"
                                                  "key   dictionary  {\"a\": <ff>, \"b\": [1]}\n"));
  device.check("prefs list", prints("com.example.a\n"));
  device.check("prefs list com.example.b", prints("no preferences in domain com.example.b\n"));
  device.check("prefs delete com.example.a key", prints(""));
  for (const auto& command : {"prefs delete com.example.a key", "prefs get com.example.a key"}) {
    device.check(command, fails("no preference key in domain com.example.a: 'tavrelctl prefs list "
                                "com.example.a' shows what there is"));
  }
  const std::string bad = "/var/mobile/Library/Preferences/com.example.bad.plist";
  device.write(bad, "nonsense");
  for (const auto& command :
       {"list com.example.bad", "get com.example.bad key", "delete com.example.bad key"}) {
    device.check(std::string("prefs ") + command,
                 fails("cannot read preferences " + device.path(bad) +
                       ": not a property list: it begins neither with \"bplist00\" nor with "
                       "\"<\"; repair it, or the next write sets it aside"));
  }
  EXPECT_EQ(device.run("prefs set com.example.a flag " + std::string(9U << 20, 'x')).status, 1);
  device.check("prefs get com.example.a flag", prints("true\n"));
}

TEST(Plist, ConvertsBetweenAllForms) {
  const TemporaryDevice device;
  const std::string json = "{\n  \"a\": [\n    1,\n    2.5\n  ],\n  \"b\": true\n}\n";
  const Outcome binary = device.run("plist convert - --to binary", json);
  EXPECT_TRUE(binary.out.starts_with("bplist00")) << binary;
  device.check("plist convert -", prints(xmlOf(json)), binary.out);
  device.check("plist convert - --to json", prints(json), xmlOf(json));
  const std::string file = device.path("/out.plist"), no = device.path("/no");
  device.check("plist convert - -o " + file, prints(""), json);
  device.check("plist show " + file, prints("a:\n  [0] = 1\n  [1] = 2.5\nb = true\n"));
  EXPECT_EQ(device.json("plist show " + file)["value"], nlohmann::json::parse(json));
  device.check("plist convert - -o /dev/null",
               fails("cannot write /dev/null: it is not a regular file: write to - and redirect"),
               json);
  const std::string link = device.path("/link");
  std::filesystem::create_symlink(file, link);
  device.check("plist convert - -o " + link,
               fails("cannot write " + link + ": it is a symbolic link: name its target"), json);
  device.check("plist convert -",
               fails("cannot write xml: standard input: it has text with control characters: use "
                     "--to binary or --to json"),
               R"({"a": ["\u0001"]})");
  device.check(
      "plist convert - -o " + no + "/x",
      fails("cannot write " + no + "/x: " + no + ": No such file or directory: create this folder"),
      json);
  EXPECT_FALSE(std::filesystem::exists(no));
  device.check("plist show -",
               fails("standard input: neither a property list nor JSON: it begins neither with "
                     "\"bplist00\" nor with \"<\", \"{\" or \"[\""),
               "hello");
  device.check("plist show -",
               fails("standard input: not JSON at column 4: unexpected end of input"), "[1,");
  device.check("plist show -",
               fails("standard input: not JSON at line 2, column 1: invalid literal"), "[1,\nx]");
}

// A whitelist, and a day's statistics including one scalar that may not leave.
void fill(const TemporaryDevice& device) {
  device.write(kWhitelistFile, xmlOf(R"({"G": {
      "ScalarKeys": {"app.starts": {"sig_fig": 2},
                     "com.norvane.zentrix.bhd.database.corruptions": {}},
      "DistributionKeys": {"app.load": {"intervals": [2, 3]}}}})"));
  std::string lines = "scalar\t20000\tapp.starts\t12345\nscalar\t20000\tapp.secret\t7\n";
  for (int i = 1; i <= 4; ++i)
    lines += format("value\t20000\tapp.load\t%d\t%d\n", i, i);
  device.check("stat import -", prints("standard input: 2 scalars, 4 values\n"), lines);
  device.run("prefs set com.norvane.tallied DatabaseCorruptionCount 3 --int");
}

TEST(LogPreview, ShowsTheLogOfARunAndChangesNothing) {
  const TemporaryDevice device;
  fill(device);
  device.run("stat import", "scalar\t-2147483648\tapp.starts\t1\n");
  LinuxPlatform(device.root).store().BHClientCheckpoint();
  const auto before = device.files();
  const Outcome xml = device.run("log preview --day 20000");
  EXPECT_EQ(xml, prints(xml.out));
  const auto log = device.json("plist show -", xml.out)["value"];
  EXPECT_EQ(log["BHScalars"].dump(),
            R"({"app.starts":12000,"com.norvane.zentrix.bhd.database.corruptions":3})");
  EXPECT_EQ(log["BHStartDate"], R"({"$date": "2024-10-04T00:00:00Z"})"_json);

  const auto json = device.json("log preview --day 2024-10-04")["log"];
  EXPECT_EQ(json["day"], 20000);
  EXPECT_EQ(json["type"], "193");
  EXPECT_EQ(json["options"], R"({"previous_os_version": "<unknown>"})"_json);
  EXPECT_EQ(json["distributions"], R"json({"app.load": {
      "count": 4, "minimum": 1.0, "maximum": 4.0, "mean": 2.5, "sum_of_squared_deviations": 5.0,
      "standard_deviation": 1.118033988749895,
      "histogram": [{"bucket": "(-inf, 2]", "count": 2}, {"bucket": "(2, 3]", "count": 1},
                    {"bucket": "(3, inf)", "count": 1}]}})json"_json);

  const auto first = device.json("log preview --day -2147483648")["log"];
  EXPECT_EQ(first["day"], -2147483648);
  EXPECT_EQ(first["start"], "-5877641-06-23T00:00:00Z");

  const std::string none = "no log would be filed for day ";
  device.check("log preview --day 19999",
               fails(none + "19999 (2024-10-03): no value found for any whitelisted key"));
  const Outcome verbose = device.run("log preview --day 20000 -v");
  EXPECT_EQ(verbose.out.size(), xml.out.size());
  expectIn(verbose.error, {"info: writing tallied log. yesterday=20000\n"});
  EXPECT_EQ(device.files(), before);

  // Output that a failure makes incomplete counts as a failure.
  const std::string preferences =
      device.path("/var/mobile/Library/Preferences/com.norvane.tallied.plist");
  const std::string kept = contentOf(preferences);
  const std::string noList =
      ": not a property list: it begins neither with \"bplist00\" nor with \"<\"";
  std::ofstream(preferences) << "junk";
  const Outcome incomplete = device.run("log preview --day 20000");
  EXPECT_EQ(incomplete.status, 1);
  EXPECT_EQ(incomplete.error, "tavrelctl: cannot read preferences " + preferences + noList +
                                  "; repair it, or the next write sets it aside\n");
  EXPECT_EQ(device.run("log preview --day 20000 -v").status, 1);
  std::ofstream(preferences) << kept;

  // What each content of the whitelist's file is to a preview; empty for none.
  const std::pair<const char*, std::string> kFaults[] = {
      {"", "cannot read " + device.path(kWhitelistFile) +
               ": No such file or directory: write a whitelist, as tavrel(8) describes it"},
      {"junk",
       device.path(kWhitelistFile) + noList + ": repair it, or replace it with another whitelist"}};
  const auto setWhitelist = [&](const std::string& content) {
    std::filesystem::remove(device.path(kWhitelistFile));
    if (!content.empty()) device.write(kWhitelistFile, content);
  };
  for (const auto& [content, fault] : kFaults) {
    setWhitelist(content);
    device.check("log preview --day 20000", fails(none + "20000 (2024-10-04): " + fault));
  }

  fill(device);
  LinuxPlatform(device.root).store().BHClientCheckpoint();
  device.write(kStore, "not a database, and long enough to be taken for a damaged one");
  const auto damaged = device.files();
  const Outcome outcome = device.run("log preview --day 20000");
  EXPECT_TRUE(outcome.error.ends_with("; the next run sets it aside\n")) << outcome;
  for (const auto& reading : {"log preview --day 20000", "status", "stat list", "stat export"})
    EXPECT_EQ(device.run(reading).status, 1) << reading;
  EXPECT_EQ(device.files(), damaged);
  // Neither fault hides the other.
  const std::string noLog = "tavrelctl: " + none + "20000 (2024-10-04): ";
  ASSERT_TRUE(outcome.error.starts_with(noLog)) << outcome;
  for (const auto& [content, fault] : kFaults) {
    setWhitelist(content);
    EXPECT_EQ(device.run("log preview --day 20000").error,
              "tavrelctl: " + outcome.error.substr(noLog.size()) + noLog + fault + "\n");
  }
}

TEST(LogList, SaysWhichLogCannotBeRead) {
  const TemporaryDevice device;
  const std::string name = "pending/log-tallied-20261127T180218Z-5f0c9a1e";
  device.fileLog(name, "x", R"({"Name": "log-tallied"})");
  const std::string path = device.path(kSubmission + name + ".log");
  std::filesystem::resize_file(path, limits::kPropertyListBytes + 1);
  const Outcome listed = device.run("log list");
  EXPECT_EQ(listed.status, 1);
  EXPECT_EQ(listed.error, format("tavrelctl: cannot use %s: it has more than %zu bytes; move it "
                                 "away; the day of such a log is not shown\n",
                                 path, limits::kPropertyListBytes));
  device.fileLog(name, "<plist>\n", R"({"LogName": "log-tallied"})");
  EXPECT_EQ(device.run("log list").error, "tavrelctl: damaged: 1 log, the first " + path +
                                              ": 'tavrelctl log show FILE' says what is wrong\n");
  device.check("log show", fails(path + " is damaged: XML property list, line 2, column 1: no "
                                        "element found: 'tavrelctl log show --raw FILE' "
                                        "prints its bytes"));
  device.write("/empty", "");
  const std::string empty = device.path("/empty");
  device.check({"log", "show", empty},
               fails("not a log: " + empty + ": it is empty: 'tavrelctl log list' shows the logs"));
}

using LogShow = DeviceTest;

TEST_F(LogShow, SaysWhyThereIsNoLog) {
  const std::string own = "com.norvane.tallied.tavrel ";
  const std::string dayKey = own + "LastCrashLogSerializationDateInDaysSince1970";
  device.run("prefs set " + dayKey + " 2000000000 --int");
  const auto today = device.json("status")["today"];
  const std::string next = "next run: no log for day " + today["day"].dump() + " (" +
                           today["date"].get<std::string>() + "): ";
  const std::pair<std::string, std::string> kCases[] = {
      {"list", next + "no permission for that day"},
      {"set com.norvane.zentrix DiagnosticSubmissionEnabled true --bool",
       next + "no usable whitelist; see 'tavrelctl whitelist check'"},
      {"delete " + dayKey, "last daily run: none yet"},
      {"set " + dayKey + " 20001 --int", "last daily run: day 20001 (2024-10-05), outcome unknown"},
      {"set " + own + "LastLogOutcome filed", "last daily run: a log for day 20001 (2024-10-05)"}};
  for (const auto& [change, why] : kCases) {
    if (change.starts_with("delete")) device.write(kWhitelistFile, xmlOf("{}"));
    device.run("prefs " + change);
    device.check("log show", fails("no daily log found; " + why +
                                   "; 'tavrelctl log preview' shows what a log would contain"));
  }
}

TEST_F(LogShow, DrawsTheTableOfASubmittedLog) {
  const std::string pending = device.path(kSubmission) + "pending/";
  device.check("log list", prints("no logs\n"));
  device.check("log show nothing",
               fails("no log or file nothing: 'tavrelctl log list' shows the logs"));
  const std::string log = xmlOf(R"json({
    "BHCrashLogVersion": 1,
    "BHStartDate": {"$date": "2024-10-04T00:00:00Z"},
    "BHLogCreationDate": {"$date": "2024-10-05T03:00:00Z"},
    "BHMetadata": {"BHUserInterfaceLanguage": "de"},
    "BHScalars": {"app.starts": 12000, "app.x": -7},
    "BHDistributions": {"app.load": [1.0, 4.0, 2.5, 5.0, 4], "app.none": [0.0, 0.0, 0.0, 0.0, 0]},
    "BHDistributionsHistogram": {"app.load": {"(100, inf)": 1, "(20, 100]": 4, "(-inf, 20]": 8}},
    "BHTasking": [], "BHTaskID": "(no tasking id)", "BHTaskDigest": "(no tasking digest)",
    "BHWhitelistDigest": "0123456789abcdef0123456789abcdef",
    "BHActivatedAppInfo": [{"bundle_id": "org.example.app"}]})json");
  device.fileLog("pending/log-tallied-b", log, R"json({
      "LogType": "193", "LogName": "log-tallied", "OSVersion": "Ostara 4 (8B)",
      "Time": {"$date": "2024-10-05T03:00:01Z"}})json");
  device.fileLog("pending/StorageStatus-a", "line\x1b one\n\nline two", R"({
      "LogType": "165", "LogName": "StorageStatus", "Time": {"$date": "2024-10-04T03:00:01Z"}})");
  device.check("log list",
               prints("DAY         RUN      SIZE  PLACE    FILE\n"
                      "-                19 bytes  pending  StorageStatus-a.log\n"
                      "2024-10-04        1.4 KiB  pending  log-tallied-b.log\n"),
               "", 40);
  // A folder is not a log, whatever its name.
  std::filesystem::create_directories(pending + "folder.log");
  device.check("log show", prints("Log           " + pending + R"(log-tallied-b.log (pending)
Type          193
Name          log-tallied
Filed         2024-10-05 03:00:01 +0000
OS version    Ostara 4 (8B)
Day           20000 (2024-10-04)
Created       2024-10-05 03:00:00 +0000
Version       1
Whitelist     0123456789abcdef0123456789abcdef
Tasking       (no tasking id)
Task digest   (no tasking digest)
Settings      0

Metadata (1)
  BHUserInterfaceLanguage  de

Scalars (2)
  app.starts  12000
  app.x          -7

Distributions (2)
  KEY       COUNT  MINIMUM  MAXIMUM  MEAN  STD DEVIATION
  app.load      4        1        4   2.5     1.11803399
  app.none      0        0        0     0              -

Histogram of app.load
  (-inf, 20]  8  ###########################################
  (20, 100]   4  #####################
  (100, inf)  1  #####

Activated applications (1)
  {"bundle_id": "org.example.app"}
)"),
               "", 60);
  device.check("log show --raw log-tallied-b", prints(log));
  device.check("log show StorageStatus-a.log",
               prints("Log           " + pending + R"(StorageStatus-a.log (pending)
Type          165
Name          StorageStatus
Filed         2024-10-04 03:00:01 +0000

line\x1b one

line two
)"));
  device.check("log show S --json", device.run("log show StorageStatus-a --json"));
  EXPECT_TRUE(
      device.run("log show -", log).out.starts_with("Log           standard input (file)\n"));
  const std::string bytes = "\x7f\x45LF\xff";
  device.check("log show -",
               fails("not a log: standard input: it is neither a property list nor text: "
                     "'tavrelctl log list' shows the logs"),
               bytes);
  device.check("log show --raw -", prints(bytes), bytes);
  const auto json = device.json("log show")["log"];
  EXPECT_EQ(json["distributions"]["app.none"]["standard_deviation"], nullptr);
  EXPECT_EQ(json["faults"].dump(), "[]");

  // Of two logs from the same second, the one written later is the latest.
  const std::string other = pending + "log-tallied-b.metadata.plist";
  device.write(kSubmission + "pending/log-tallied-a.log", xmlOf(R"json({
    "BHScalars": "x", "BHOther": 1, "BHDistributions": {"a": [{"$real": "nan"}, 1, 1, 1, 0], "b": 1},
    "BHDistributionsHistogram": {"a": {"(1, 2]": "x", "(2, 3]": -1}, "c": {}}})json"));
  std::filesystem::copy_file(other, pending + "log-tallied-a.metadata.plist");
  std::filesystem::last_write_time(pending + "log-tallied-a.log",
                                   std::filesystem::last_write_time(pending + "log-tallied-b.log") +
                                       std::chrono::microseconds(1));
  device.check("log show log-", fails("log- is the beginning of 2 logs: give more of the name: "
                                      "'tavrelctl log list' shows them"));
  const auto mistyped = device.json("log show")["log"];
  EXPECT_EQ(mistyped["distributions"]["a"]["minimum"], R"({"$real": "nan"})"_json);
  EXPECT_FALSE(mistyped["distributions"]["a"].contains("histogram"));
  EXPECT_EQ(mistyped["faults"], R"([
      "BHDistributions/b: is not a summary of five numbers",
      "BHDistributionsHistogram/a/(1, 2]: is a string, not a number",
      "BHDistributionsHistogram/a/(2, 3]: is negative",
      "BHDistributionsHistogram/c: has no summary in BHDistributions",
      "BHOther: is not part of a tallied log",
      "BHScalars: is a string, not a dictionary"])"_json);
  expectIn(device.run("log show").out, {"\nFormat faults (6)\n  BHDistributions/b: is no"});
  device.check("log show " + other,
               fails("not a tallied log: " + other + ": 'tavrelctl plist show FILE' shows it"));
  // Only a forced run reports the day on which it files the log.
  device.fileLog("pending/log-tallied-c", log,
                 R"({"LogName": "log-tallied", "Time": {"$date": "2024-10-04T23:59:59Z"}})");
  std::string days;
  const auto list = device.json("log list");
  for (const auto& entry : list["logs"])
    days += entry["day"].dump() + ' ' + entry["date"].dump() + ' ' + entry["forced"].dump() + '\n';
  EXPECT_EQ(days, R"(null null null
20000 "2024-10-04" true
20000 "2024-10-04" null
null null null
)");
  std::filesystem::remove(other);
  EXPECT_EQ(device.run("log list").error, "tavrelctl: 1 log without metadata: cannot read " +
                                              other + ": No such file or directory\n");
}

TEST(Status, SaysWhatMayBeDoneWasDoneAndIsHeld) {
  const TemporaryDevice device;
  const auto fresh = device.json("status");
  EXPECT_EQ(fresh["submission_allowed"], false);
  EXPECT_EQ(fresh["last_reported_day"], nullptr);
  EXPECT_EQ(fresh["store"]["bytes"], nullptr);
  EXPECT_EQ(fresh["pending_logs"], 0);
  EXPECT_EQ(fresh["conclusion"]["run"], "next");
  EXPECT_EQ(fresh["conclusion"]["outcome"], "not-permitted");

  fill(device);
  device.run("prefs set com.norvane.zentrix DiagnosticSubmissionEnabled true --bool");
  device.run(
      "prefs set com.norvane.tallied.tavrel LastCrashLogSerializationDateInDaysSince1970 "
      "20001 --int");
  device.write(kSubmission + "pending/x.log", "text");
  const Outcome outcome = device.run("status");
  EXPECT_EQ(outcome.status, 0) << outcome;
  expectIn(outcome.out,
           {"Submission       allowed\n", "Last day done    20001 (2024-10-05)\n",
            "Last OS version  none yet\n", " KiB, day 20000 (2024-10-04)\n",
            "Outbox logs      0\nLast daily run   day 20001 (2024-10-05), outcome unknown\n"});
  const std::string store = device.path(kStore);
  EXPECT_EQ(device.json("status")["store"]["bytes"],
            std::filesystem::file_size(store) + std::filesystem::file_size(store + "-wal"));

  std::filesystem::remove(store);
  std::filesystem::create_symlink("/none", store);
  const Outcome linked = device.run("status");
  expectIn(linked.out, {"\nStore            unreadable\n"});
  EXPECT_EQ(linked.error,
            "tavrelctl: statistics store " + store + ": is a symbolic link: move it away\n");
  expectIn(device.run("status --check").out, {"\nCRITICAL store: "});
}

}  // namespace
}  // namespace tavrel
