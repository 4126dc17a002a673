// tavrelctl as a whole: usage, preferences, property lists, logs, status.

#include <nlohmann/json.hpp>

#include "base/format.h"
#include "device.h"
#include "platform/plist/coding.h"

namespace tavrel {
namespace {

constexpr const char* kPending = "/var/mobile/Library/Logs/Submission/pending/";

nlohmann::json jsonOf(const Outcome& outcome) {
  EXPECT_EQ(outcome.status, 0) << outcome;
  const auto json = nlohmann::json::parse(outcome.out, nullptr, false);
  EXPECT_EQ(json.value("format_version", 0), 1) << outcome;
  return json;
}

TEST(Usage, MistakesEndWithStatus2AndOneLine) {
  const TemporaryDevice device;
  const std::string kNoXmlText =
      "tavrelctl: cannot be stored: property lists hold no control characters and only UTF-8: give "
      "such bytes as --plist '{\"$data\": \"BASE64\"}'\n";
  const std::pair<std::vector<std::string>, std::string> kCases[] = {
      {{}, "tavrelctl: A subcommand is required: see 'tavrelctl --help'\n"},
      {{"frob", "x"}, "tavrelctl: no subcommand 'frob': see 'tavrelctl --help'\n"},
      {{"log", "--frob"}, "tavrelctl: no option '--frob': see 'tavrelctl log --help'\n"},
      {{"log", "frob"}, "tavrelctl: no subcommand 'frob': see 'tavrelctl log --help'\n"},
      {{"log"}, "tavrelctl: A subcommand is required: see 'tavrelctl log --help'\n"},
      {{"prefs", "get", "a"}, "tavrelctl: KEY is required: see 'tavrelctl prefs get --help'\n"},
      {{"prefs", "get", "../a", "k"},
       "tavrelctl: not a preference domain: ../a: give a name such as com.example.app, without "
       "slashes\n"},
      {{"log", "preview", "--day", "soon"},
       "tavrelctl: not a day: soon: give today, yesterday, a 32-bit day number or YYYY-MM-DD\n"},
      {{"prefs", "set", "a", "k", "x\x01"}, kNoXmlText},
      {{"prefs", "set", "a", "k\xff", "x"}, kNoXmlText},
      {{"prefs", "set", "a", "k", "[{\"\xEF\xBF\xBE\": 1}]", "--plist"}, kNoXmlText},
      {{"prefs", "set", "a", "k", "@1e300", "--date"}, ""},
      {{"prefs", "set", "a", "k", "1", "--int", "--bool"}, ""},
      {{"log", "show", "--raw", "--json"}, ""},
      {{"status", "--wrong"}, ""}};
  for (const auto& [arguments, error] : kCases) {
    const Outcome outcome = device.run(arguments);
    EXPECT_EQ(outcome.status, 2) << outcome;
    EXPECT_EQ(outcome.out, "");
    EXPECT_EQ(std::count(outcome.error.begin(), outcome.error.end(), '\n'), 1) << outcome;
    if (!error.empty()) {
      EXPECT_EQ(outcome.error, error);
    }
  }
  const std::string none = device.path("/none");
  for (const auto& arguments : {std::vector<std::string>{"status"}, {"stat", "set", "k", "1"}}) {
    EXPECT_EQ(device.runAt(none, arguments),
              fails("cannot use device root " + none +
                    "/: No such file or directory: name the device's folder with --root or "
                    "TAVREL_ROOT"));
  }
  EXPECT_EQ(device.runAt("", {"status"}),
            fails("--root: names no folder: see 'tavrelctl status --help'", 2));
  EXPECT_FALSE(std::filesystem::exists(none));
  EXPECT_EQ(device.run({"--version"}), prints("tavrelctl 0.1.0\n"));
  for (const std::vector<std::string>& help :
       {std::vector<std::string>{"--help"}, {"prefs", "set", "--help"}, {"log", "--help"}}) {
    const Outcome outcome = device.run(help);
    EXPECT_EQ(outcome.status, 0) << outcome;
    EXPECT_NE(outcome.out.find("Usage: "), std::string::npos) << outcome;
  }
}

TEST(Prefs, KeepTheKindThatWasAskedFor) {
  const TemporaryDevice device;
  const std::tuple<std::string, std::string, std::string, std::string> kCases[] = {
      {"--string", "a b", "a b\n", R"("a b")"},
      {"--bool", "yes", "true\n", "true"},
      {"--int", "-9223372036854775808", "-9223372036854775808\n", "-9223372036854775808"},
      {"--int", "18446744073709551615", "18446744073709551615\n", "18446744073709551615"},
      {"--float", "1e3", "1000.0\n", "1000.0"},
      {"--float", "-inf", "-inf\n", R"({"$real":"-inf"})"},
      {"--date", "2026-11-16", "2026-11-16 00:00:00 +0000\n",
       R"({"$date":"2026-11-16T00:00:00Z"})"},
      {"--plist", R"({"b": [1], "a": {"$data": "/w=="}})", "a = <ff>\nb:\n  [0] = 1\n",
       R"({"a":{"$data":"/w=="},"b":[1]})"}};
  for (const auto& [kind, text, shown, json] : kCases) {
    EXPECT_EQ(device.run({"prefs", "set", kind, "com.example.a", "key", "--", text}), prints(""));
    EXPECT_EQ(device.run({"prefs", "get", "com.example.a", "key"}), prints(shown));
    EXPECT_EQ(
        jsonOf(device.run({"prefs", "get", "com.example.a", "key", "--json"}))["value"].dump(),
        json);
  }
  EXPECT_EQ(device.run({"prefs", "set", "com.example.a", "flag", "true"}),
            fails("stored as a string: true: use --bool for a boolean", 0));
  EXPECT_EQ(device.run({"prefs", "set", "com.example.a", "n", "1x", "--int"}),
            fails("not an integer: 1x: give a decimal number of at most 64 bits", 2));
  EXPECT_EQ(device.run({"prefs", "list", "com.example.a"}),
            prints("KEY   TYPE        VALUE\n"
                   "flag  string      \"true\"\n"
                   "key   dictionary  {\"a\": <ff>, \"b\": [1]}\n"));
  EXPECT_EQ(device.run({"prefs", "list"}), prints("com.example.a\n"));
  EXPECT_EQ(device.run({"prefs", "list", "com.example.b"}),
            prints("no preferences in domain com.example.b\n"));
  EXPECT_EQ(device.run({"prefs", "delete", "com.example.a", "key"}), prints(""));
  const Outcome absent = fails(
      "no preference key in domain com.example.a: 'tavrelctl prefs "
      "list com.example.a' shows what there is");
  EXPECT_EQ(device.run({"prefs", "delete", "com.example.a", "key"}), absent);
  EXPECT_EQ(device.run({"prefs", "get", "com.example.a", "key"}), absent);

  device.write("/var/mobile/Library/Preferences/com.example.bad.plist", "nonsense");
  for (const std::vector<std::string>& reading :
       {std::vector<std::string>{"list", "com.example.bad"},
        {"get", "com.example.bad", "key"},
        {"delete", "com.example.bad", "key"}}) {
    auto arguments = reading;
    arguments.insert(arguments.begin(), "prefs");
    const Outcome outcome = device.run(arguments);
    EXPECT_EQ(outcome.status, 1) << outcome;
    EXPECT_EQ(std::count(outcome.error.begin(), outcome.error.end(), '\n'), 1) << outcome;
    EXPECT_NE(outcome.error.find("com.example.bad.plist"), std::string::npos) << outcome;
  }
  const Outcome large =
      device.run({"prefs", "set", "com.example.a", "flag", std::string(9U << 20, 'x')});
  EXPECT_EQ(large.status, 1) << large.error;
  EXPECT_EQ(device.run({"prefs", "get", "com.example.a", "flag"}), prints("true\n"));
}

TEST(Plist, ConvertsBetweenAllForms) {
  const TemporaryDevice device;
  const std::string json = "{\n  \"a\": [\n    1,\n    2.5\n  ],\n  \"b\": true\n}\n";
  const Outcome binary = device.run({"plist", "convert", "-", "--to", "binary"}, json);
  EXPECT_TRUE(binary.out.starts_with("bplist00")) << binary;
  const Outcome xml = device.run({"plist", "convert", "-"}, binary.out);
  EXPECT_EQ(xml, prints(xmlOf(json)));
  EXPECT_EQ(device.run({"plist", "convert", "-", "--to", "json"}, xml.out), prints(json));

  const std::string file = device.path("/out.plist");
  EXPECT_EQ(device.run({"plist", "convert", "-", "-o", file}, json), prints(""));
  EXPECT_EQ(device.run({"plist", "show", file}), prints("a:\n  [0] = 1\n  [1] = 2.5\nb = true\n"));
  EXPECT_EQ(jsonOf(device.run({"plist", "show", file, "--json"}))["value"],
            nlohmann::json::parse(json));

  EXPECT_EQ(device.run({"plist", "convert", "-", "-o", "/dev/null"}, json),
            fails("cannot write /dev/null: it is no regular file: use -o - and "
                  "redirect"));
  EXPECT_EQ(device.run({"plist", "convert", "-", "-o", device.path("/no/x")}, json),
            fails("cannot write " + device.path("/no/x") + ": " + device.path("/no") +
                  ": No such file or directory"));
  EXPECT_FALSE(std::filesystem::exists(device.path("/no")));
  EXPECT_EQ(device.run({"plist", "show", "-"}, "hello"),
            fails("standard input: neither a property list nor JSON: it begins "
                  "neither with \"bplist00\" nor with \"<\""));
  EXPECT_EQ(device.run({"plist", "show", "-"}, "[1,"),
            fails("standard input: parse error at line 1, column 4: syntax error "
                  "while parsing value - unexpected end of input; expected '[', '{', or a "
                  "literal"));
}

// A whitelist, and a day's statistics of which one scalar may not leave.
void fill(const TemporaryDevice& device) {
  device.write(kWhitelistFile, xmlOf(R"({"G": {
      "ScalarKeys": {"app.starts": {"sig_fig": 2},
                     "com.norvane.zentrix.bhd.database.corruptions": {}},
      "DistributionKeys": {"app.load": {"intervals": [2, 3]}}}})"));
  const Outcome imported = device.run({"stat", "import", "-"},
                                      "scalar\t20000\tapp.starts\t12345\n"
                                      "scalar\t20000\tapp.secret\t7\n"
                                      "value\t20000\tapp.load\t1\t1\n"
                                      "value\t20000\tapp.load\t2\t2\n"
                                      "value\t20000\tapp.load\t3\t3\n"
                                      "value\t20000\tapp.load\t4\t4\n");
  EXPECT_EQ(imported.status, 0) << imported;
  device.run({"prefs", "set", "com.norvane.tallied", "DatabaseCorruptionCount", "3", "--int"});
}

TEST(LogPreview, ShowsTheLogOfARunAndChangesNothing) {
  const TemporaryDevice device;
  fill(device);
  device.run({"stat", "import"}, "scalar\t-2147483648\tapp.starts\t1\n");
  const auto before = device.files();
  const Outcome xml = device.run({"log", "preview", "--day", "20000"});
  EXPECT_EQ(xml.status, 0) << xml;
  EXPECT_EQ(xml.error, "");
  const auto document = plist::read(asBytes(xml.out));
  ASSERT_TRUE(document) << xml;
  const plist::Dictionary log = document->dictionary();
  EXPECT_EQ(log.get("BHScalars"),
            plist::Value(plist::Dictionary{{"app.starts", 12000},
                                           {"com.norvane.zentrix.bhd.database.corruptions", 3}}));
  EXPECT_EQ(log.get("BHStartDate"), plist::Value(plist::Date::ofDay(20000)));

  const auto json = jsonOf(device.run({"log", "preview", "--day", "2024-10-04", "--json"}))["log"];
  EXPECT_EQ(json["day"], 20000);
  EXPECT_EQ(json["type"], "193");
  EXPECT_EQ(json["options"], nlohmann::json::parse(R"({"previous_os_version": "<unknown>"})"));
  EXPECT_EQ(json["distributions"], nlohmann::json::parse(R"json({"app.load": {
      "count": 4, "minimum": 1.0, "maximum": 4.0, "mean": 2.5, "sum_of_squared_deviations": 5.0,
      "standard_deviation": 1.118033988749895,
      "histogram": [{"bucket": "(-inf, 2]", "count": 2}, {"bucket": "(2, 3]", "count": 1},
                    {"bucket": "(3, inf)", "count": 1}]}})json"));

  const auto first =
      jsonOf(device.run({"log", "preview", "--day", "-2147483648", "--json"}))["log"];
  EXPECT_EQ(first["day"], -2147483648);
  EXPECT_EQ(first["start"], "-5877641-06-23T00:00:00Z");

  EXPECT_EQ(device.run({"log", "preview", "--day", "19999"}),
            fails("no log would be submitted for day 19999 (2024-10-03): no "
                  "value found for any whitelisted key"));
  const Outcome verbose = device.run({"log", "preview", "--day", "20000", "-v"});
  EXPECT_EQ(verbose.out.size(), xml.out.size());
  EXPECT_NE(verbose.error.find("info: writing tallied log. yesterday=20000\n"), std::string::npos)
      << verbose.error;
  EXPECT_EQ(device.files(), before);

  std::filesystem::remove(device.path(kWhitelistFile));
  EXPECT_EQ(
      device.run({"log", "preview", "--day", "20000"}).error,
      "tavrelctl: Couldn't load whitelist\ntavrelctl: no log would be submitted for day 20000 "
      "(2024-10-04): cannot read " +
          device.path(kWhitelistFile) + ": No such file or directory\n");

  fill(device);
  const std::string store = "/var/mobile/Library/Brimhold/BHDataStore.sqlitedb";
  device.write(store, "not a database, and long enough to be taken for a damaged one");
  const auto damaged = device.files();
  const Outcome outcome = device.run({"log", "preview", "--day", "20000"});
  EXPECT_EQ(outcome.status, 1);
  EXPECT_TRUE(outcome.error.ends_with("; the next run sets it aside\n")) << outcome;
  for (const std::vector<std::string>& reading :
       {std::vector<std::string>{"status"}, {"stat", "list"}, {"stat", "export"}}) {
    EXPECT_EQ(device.run(reading).status, 1);
  }
  EXPECT_EQ(device.files(), damaged);
}

TEST(LogShow, DrawsTheTableOfASubmittedLog) {
  const TemporaryDevice device;
  EXPECT_EQ(device.run({"log", "list"}), prints("no logs\n"));
  const auto showFails = [&device](const std::string& why) {
    EXPECT_EQ(device.run({"log", "show"}),
              fails("no daily log is here; " + why +
                    "; 'tavrelctl log preview' shows what a log would hold"));
  };
  const std::string own = "com.norvane.tallied.tavrel";
  const std::string dayKey = "LastCrashLogSerializationDateInDaysSince1970";
  device.run({"prefs", "set", own, dayKey, "2000000000", "--int"});
  const auto today = jsonOf(device.run({"status", "--json"}))["today"];
  const std::string next = "next run: no log for day " + today["day"].dump() + " (" +
                           today["date"].get<std::string>() + "): ";
  showFails(next + "diagnostic submission not allowed");
  device.run(
      {"prefs", "set", "com.norvane.zentrix", "DiagnosticSubmissionEnabled", "true", "--bool"});
  showFails(next + "no usable whitelist");
  device.write(kWhitelistFile, xmlOf("{}"));
  device.run({"prefs", "delete", own, dayKey});
  showFails("last run: none yet");
  device.run({"prefs", "set", own, dayKey, "20001", "--int"});
  showFails("last run: day 20001 (2024-10-05), outcome unknown");
  device.run({"prefs", "set", own, "LastLogOutcome", "nothing-to-report"});
  showFails("last run: no log for day 20001 (2024-10-05): no value found for any whitelisted key");
  device.run({"prefs", "set", own, "LastLogOutcome", "filed"});
  showFails("last run: a log for day 20001 (2024-10-05)");

  const std::string log = xmlOf(R"json({
    "BHCrashLogVersion": 1,
    "BHStartDate": {"$date": "2024-10-04T00:00:00Z"},
    "BHLogCreationDate": {"$date": "2024-10-05T03:00:00Z"},
    "BHMetadata": {"BHUserInterfaceLanguage": "de"},
    "BHScalars": {"app.starts": 12000, "app.x": -7},
    "BHDistributions": {"app.load": [1.0, 4.0, 2.5, 5.0, 4], "app.none": [0.0, 0.0, 0.0, 0.0, 0]},
    "BHDistributionsHistogram": {"app.load": {"(100, inf)": 1, "(20, 100]": 4, "(-inf, 20]": 8}},
    "BHTasking": [],
    "BHTaskID": "(no tasking id)",
    "BHTaskDigest": "(no tasking digest)",
    "BHWhitelistDigest": "0123456789abcdef0123456789abcdef",
    "BHActivatedAppInfo": [{"bundle_id": "org.example.app"}]
  })json");
  device.write(std::string(kPending) + "log-tallied-b.log", log);
  device.write(std::string(kPending) + "log-tallied-b.metadata.plist", xmlOf(R"json({
    "LogType": "193", "LogName": "log-tallied", "OSVersion": "Ostara 4 (8B)",
    "Time": {"$date": "2024-10-05T03:00:01Z"}})json"));
  device.write(std::string(kPending) + "StorageStatus-a.log", "line\x1b one\n\nline two");
  device.write(std::string(kPending) + "StorageStatus-a.metadata.plist", xmlOf(R"({
    "LogType": "165", "LogName": "StorageStatus", "Time": {"$date": "2024-10-04T03:00:01Z"}})"));

  const Outcome listed = device.run({"log", "list"}, "", 40);
  EXPECT_EQ(listed, prints("DAY         RUN      SIZE  PLACE    FILE\n"
                           "-                19 bytes  pending  StorageStatus-a.log\n"
                           "2024-10-04        1.4 KiB  pending  log-tallied-b.log\n"));
  // A folder is no log, whatever its name.
  std::filesystem::create_directories(device.path(kPending) + "folder.log");
  EXPECT_EQ(device.run({"log", "show"}, "", 60),
            prints("Log           " + device.path(kPending) + R"(log-tallied-b.log (pending)
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
)"));
  EXPECT_EQ(device.run({"log", "show", "--raw", "log-tallied-b"}), prints(log));
  EXPECT_EQ(device.run({"log", "show", "StorageStatus-a.log"}),
            prints("Log           " + device.path(kPending) +
                   "StorageStatus-a.log (pending)\n"
                   "Type          165\n"
                   "Name          StorageStatus\n"
                   "Filed         2024-10-04 03:00:01 +0000\n"
                   "\n"
                   "line\\x1b one\n\nline two\n"));
  EXPECT_EQ(device.run({"log", "show", "S", "--json"}),
            device.run({"log", "show", "StorageStatus-a", "--json"}));
  EXPECT_EQ(device.run({"log", "show", "-"}, log).out.substr(0, 36),
            "Log           standard input (file)\n");
  const std::string bytes =
      "\x7f"
      "ELF\xff";
  EXPECT_EQ(
      device.run({"log", "show", "-"}, bytes),
      fails("not a log: standard input: it is neither a property list nor text: 'tavrelctl log "
            "list' shows the logs"));
  EXPECT_EQ(device.run({"log", "show", "--raw", "-"}, bytes), prints(bytes));
  const auto json = jsonOf(device.run({"log", "show", "--json"}))["log"];
  EXPECT_EQ(json["scalars"], nlohmann::json::parse(R"({"app.starts": 12000, "app.x": -7})"));
  EXPECT_EQ(json["distributions"]["app.none"]["standard_deviation"], nullptr);
  EXPECT_EQ(json["created"], "2024-10-05T03:00:00Z");
  EXPECT_EQ(json["faults"], nlohmann::json::array());

  // Of two logs of one second the one that was written later is the latest.
  const std::string odd = xmlOf(R"json({
    "BHScalars": "x", "BHOther": 1, "BHDistributions": {"a": [{"$real": "nan"}, 1, 1, 1, 0], "b": 1},
    "BHDistributionsHistogram": {"a": {"(1, 2]": "x"}, "c": {}}})json");
  device.write(std::string(kPending) + "log-tallied-a.log", odd);
  std::filesystem::copy_file(device.path(kPending) + "log-tallied-b.metadata.plist",
                             device.path(kPending) + "log-tallied-a.metadata.plist");
  const auto written =
      std::filesystem::last_write_time(device.path(kPending) + "log-tallied-b.log");
  std::filesystem::last_write_time(device.path(kPending) + "log-tallied-a.log",
                                   written + std::chrono::microseconds(1));
  EXPECT_EQ(device.run({"log", "show", "log-"}),
            fails("log- is the beginning of 2 logs: give more of the name: 'tavrelctl log list' "
                  "shows them"));
  const auto mistyped = jsonOf(device.run({"log", "show", "--json"}))["log"];
  EXPECT_EQ(mistyped["distributions"]["a"]["minimum"],
            nlohmann::json::parse(R"({"$real": "nan"})"));
  EXPECT_EQ(mistyped["faults"], nlohmann::json::parse(R"([
      "BHDistributions/b: is no summary of five numbers",
      "BHDistributionsHistogram/a/(1, 2]: is a string, not a number",
      "BHDistributionsHistogram/c: belongs to no summary in BHDistributions",
      "BHOther: is no part of a tallied log",
      "BHScalars: is a string, not a dictionary"])"));
  const Outcome shown = device.run({"log", "show"});
  EXPECT_NE(shown.out.find("\nNot as a tallied log has it (5)\n  BHDistributions/b: is no"),
            std::string::npos)
      << shown;
  const std::string other = device.path(kPending) + "log-tallied-b.metadata.plist";
  EXPECT_EQ(device.run({"log", "show", other}),
            fails("not a tallied log: " + other + ": 'tavrelctl plist show FILE' shows it"));
  // Only a forced run reports the day on which it files.
  device.write(std::string(kPending) + "log-tallied-c.log", log);
  device.write(std::string(kPending) + "log-tallied-c.metadata.plist",
               xmlOf(R"({"LogName": "log-tallied", "Time": {"$date": "2024-10-04T23:59:59Z"}})"));
  std::string days;
  const auto list = jsonOf(device.run({"log", "list", "--json"}));
  for (const auto& entry : list["logs"])
    days += entry["day"].dump() + ' ' + entry["date"].dump() + ' ' + entry["forced"].dump() + '\n';
  EXPECT_EQ(days,
            "null null null\n20000 \"2024-10-04\" true\n20000 \"2024-10-04\" null\n"
            "null null null\n");
  std::filesystem::remove(other);
  EXPECT_EQ(device.run({"log", "list"}).error, "tavrelctl: 1 log without metadata: cannot read " +
                                                   other + ": No such file or directory\n");
}

TEST(Status, SaysWhatMayBeDoneWasDoneAndIsHeld) {
  const TemporaryDevice device;
  const auto fresh = jsonOf(device.run({"status", "--json"}));
  EXPECT_EQ(fresh["submission_allowed"], false);
  EXPECT_EQ(fresh["last_reported_day"], nullptr);
  EXPECT_EQ(fresh["store"]["bytes"], nullptr);
  EXPECT_EQ(fresh["pending_logs"], 0);
  EXPECT_EQ(fresh["conclusion"]["run"], "next");
  EXPECT_EQ(fresh["conclusion"]["outcome"], "not-permitted");

  fill(device);
  device.run(
      {"prefs", "set", "com.norvane.zentrix", "DiagnosticSubmissionEnabled", "true", "--bool"});
  device.run({"prefs", "set", "com.norvane.tallied.tavrel",
              "LastCrashLogSerializationDateInDaysSince1970", "20001", "--int"});
  device.write(std::string(kPending) + "x.log", "text");
  const auto bytes =
      std::filesystem::file_size(device.path("/var/mobile/Library/Brimhold/BHDataStore.sqlitedb"));
  const Outcome outcome = device.run({"status"});
  EXPECT_EQ(outcome.status, 0) << outcome;
  for (const std::string& line :
       {std::string("Submission         allowed\n"),
        std::string("Last reported day  20001 (2024-10-05)\n"),
        std::string("Last OS version    none yet\n"),
        format("Store              %llu bytes, day 20000 (2024-10-04)\n", std::uint64_t{bytes}),
        std::string("Pending logs       1\nLast run           day 20001 (2024-10-05), outcome "
                    "unknown\n")}) {
    EXPECT_NE(outcome.out.find(line), std::string::npos) << line << outcome;
  }
}

}  // namespace
}  // namespace tavrel
