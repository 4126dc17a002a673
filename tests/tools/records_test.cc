// tavrelctl records and nandlog.
#include <csignal>
#include <functional>
#include <unistd.h>

#include "device.h"
#include "tools/records/record_reader.h"

namespace tavrel {
namespace {

using namespace std::string_literals;

const std::string kRecords = "/var/mobile/Library/Logs/CrashReporter/StructuredData/";

std::string recordLine(const std::string& time, int type, const std::string& content) {
  return format("{\"time\":\"2026-11-27T%s\",\"type\":%d,\"record\":%s}\n", time, type, content);
}

const std::string kEccLine =
    recordLine("18:02:18.250Z", 172, R"({"id":4,"count":2,"reg0":18446744073709551615,"reg1":-1})");
const std::string kTelemetryLine =
    recordLine("18:02:17.000Z", 176, R"({"RD":1,"s[0]":7,"s[1]":8,"s[3]":9,"t[0]":0.5})");

TEST(Records, ListsFilesAndShowsTheirRecordsByTime) {
  const TemporaryDevice device;
  device.check("records list", prints("no records\n"));
  device.check("records show", prints("no records\n"));
  EXPECT_EQ(device.json("records show")["records"].dump(), "[]");
  device.write(kRecords + "172-2026-11-27.jsonl", kEccLine + "{\"time\":1}\n\xff\n" +
                                                      std::string(5000, '[') + "\n\0\0\0\n"s +
                                                      R"({"time":"x","type":172,"record":{"a":)");
  device.write(kRecords + "176-2026-11-27.jsonl", kTelemetryLine + "\n");
  device.write(kRecords + "176-2026-11-02.jsonl",  // from an editor
               "\xEF\xBB\xBF" + recordLine("03:00:00.000Z", 176, "{\"Factory Count\":7}"));
  device.write(kRecords + "notes.txt", kEccLine);
  device.write(kRecords + "4294967296-2026-11-27.jsonl", kEccLine);

  const std::string torn =
      "tavrelctl: 2 lines of " + device.path(kRecords) +
      "172-2026-11-27.jsonl left out, torn by a kill or a power cut; the first is line 5\n";
  device.check("records list", (Outcome{1,
                                        "TYPE  DAY                 RECORDS       SIZE\n"
                                        " 176  20759 (2026-11-02)        1   79 bytes\n"
                                        " 172  20784 (2026-11-27)        4    5.0 KiB\n"
                                        " 176  20784 (2026-11-27)        1  104 bytes\n",
                                        torn}));
  const Outcome all = device.run("records show");
  EXPECT_EQ(
      all,
      (Outcome{
          1,
          "2026-11-27T03:00:00.000Z  176  Factory Count=7\n"
          "2026-11-27T18:02:17.000Z  176  RD=1 s=[7,8] s[3]=9 t=[0.5]\n"
          "2026-11-27T18:02:18.250Z  172  id=4 count=2 reg0=18446744073709551615 reg1=-1\n",
          torn + "tavrelctl: 3 lines skipped, not a record; the first is line 2 of " +
              device.path(kRecords) +
              "172-2026-11-27.jsonl: not an object with \"time\", \"type\" and \"record\"\n"}));
  EXPECT_EQ(device.run("records show --day 2026-11-02").out,
            all.out.substr(0, all.out.find('\n') + 1));
  EXPECT_EQ(device.run("records show --type 0176 --day 20784", "", 48).out,
            "2026-11-27T18:02:17.000Z  176  RD=1 s=[7,8] s[3…\n");
  EXPECT_EQ(device.json("records show --type 172", "", 1)["records"][0].dump(),
            nlohmann::json::parse(kEccLine).dump());
  EXPECT_EQ(device.json("records show --day 2026-11-02")["records"].size(), 1U);
  EXPECT_EQ(device.run("records show --day soon").status, 2);

  std::filesystem::remove(device.path(kRecords) + "172-2026-11-27.jsonl");
  std::filesystem::create_directory(device.path(kRecords) + "172-2026-11-27.jsonl");
  device.check("records show --day 20784",
               {1, "2026-11-27T18:02:17.000Z  176  RD=1 s=[7,8] s[3]=9 t=[0.5]\n",
                "tavrelctl: cannot read " + device.path(kRecords) +
                    "172-2026-11-27.jsonl: it is not a regular file\n"});
  EXPECT_EQ(device.run("records show --type 172").out, "");
}

TEST(Records, ReaderHandsOutEachLineOnceWhateverItsLength) {
  const TemporaryDevice device;
  const std::string large(200'000, 'x');  // more than a block
  RecordReader reader(device.path("/lines"));
  std::vector<std::string> lines;
  const auto read = [&](const std::string& content, bool takesRest) {
    device.write("/lines", content);
    lines.clear();
    EXPECT_TRUE(reader.read(takesRest, [&](std::string_view line, std::uint64_t number) {
      lines.push_back(std::to_string(number) + std::string(line));
    }));
    return lines;
  };
  EXPECT_EQ(read("a\n" + large, false), (std::vector<std::string>{"1a"}));
  EXPECT_EQ(read("a\n" + large + "b\nc", false), (std::vector<std::string>{"2" + large + "b"}));
  EXPECT_TRUE(reader.wholeness());
  EXPECT_EQ(read("a\n" + large + "b\nc", true), std::vector<std::string>());
  EXPECT_FALSE(reader.wholeness());
  EXPECT_EQ(read("new\ntorn", false), (std::vector<std::string>{"1new"}));
  EXPECT_EQ(read("new\n", false), std::vector<std::string>());  // the writer has truncated the end
  EXPECT_EQ(read("new\nlonger\n", false), (std::vector<std::string>{"2longer"}));
  Openings opened(reader.path());
  EXPECT_TRUE(reader.read(false, [](std::string_view, std::uint64_t) { ADD_FAILURE(); }));
  EXPECT_EQ(opened.take(), 0);  // it has not grown
}

// Calls a hook whenever output is flushed.
struct HookedBuffer final : std::stringbuf {
  int sync() override {
    hook(str());
    return 0;
  }
  std::function<void(const std::string& printed)> hook;
};

TEST(Records, FollowsWhatIsFiledUntilASignalComes) {
  for (const bool json : {false, true}) {
    const TemporaryDevice device;
    HookedBuffer buffer;
    const std::string part = kTelemetryLine.substr(0, 20);
    const std::string first = json ? kEccLine : "count=2";
    const std::string second = json ? kTelemetryLine : "s=[7,8]";
    int stage = 0;
    buffer.hook = [&](const std::string& printed) {
      if (stage == 0) {  // there has been no folder so far
        device.write(kRecords + "172-2026-11-27.jsonl", kEccLine + part);
        stage = 1;
      } else if (stage == 1 && printed.find(first) != std::string::npos) {
        EXPECT_EQ(printed.find("RD"), std::string::npos);
        std::ofstream(device.path(kRecords) + "172-2026-11-27.jsonl", std::ios::app)
            << kTelemetryLine.substr(part.size());
        stage = 2;
      } else if (stage == 2 && printed.find(second) != std::string::npos) {
        stage = 3;
        raise(SIGTERM);
      }
    };
    std::istringstream in;
    std::ostream out(&buffer);
    std::ostringstream error;
    const CommandLine command =
        "--root " + device.path("") + " records show --follow" + (json ? " --json" : "");
    EXPECT_EQ(runTavrelctl(command, {.in = in, .out = out, .error = error}), 0);
    EXPECT_EQ(error.str(), "");
    EXPECT_EQ(stage, 3);
    if (json) {
      EXPECT_EQ(buffer.str(), kEccLine + kTelemetryLine);
    }
  }
}

TEST(Nandlog, ShowsTheNewestLogAndWhenTheNextMayBeWritten) {
  const TemporaryDevice device;
  device.check("nandlog show",
               {1, "Next log        the next run may write one; none has been written yet\n",
                "tavrelctl: no NAND log found: a run writes one when write amplification is "
                "high\n"});
  const std::string outbox = device.path(kSubmission) + "outbox/";
  const auto file = [&](const std::string& name, const char* type, const std::string& text) {
    device.fileLog("outbox/" + name, text,
                   format(R"({"LogType": "%s", "LogName": "StorageStatus",
                              "Time": {"$date": "2026-11-1%s:00:00Z"}})",
                          type, name));
  };
  file("6T18", "165",
       "System ID: 1-2\nOS Version: A: b\n\n2026-11-16 18:02:18 +0000 a b[211]: "
       "UserWamp:2.05;com.norvane.NANDInfo.x:7;odd:key:99999999999999999999;ValidityList[0]:12,-1;"
       "IntermediateWamp:inf\n");
  file("6T17", "165", "older");
  file("7T18", "193", "other");
  device.run("prefs set com.norvane.zentrix.tavrel SSLastLoggedAt 2026-01-01T00:00:00Z --date");
  device.check("nandlog show", prints("Log             " + outbox +
                                      R"(6T18.log (outbox)
System ID       1-2
OS Version      A: b
Written by      a b[211]

Write amplification (2)
  UserWamp          2.05
  IntermediateWamp   inf

NAND information (1)
  com.norvane.NANDInfo.x  7

Valid pages by bucket (1)
  ValidityList[0]  12,-1

Others (1)
  odd:key  99999999999999999999

Next log        the next run may write one; the last was written 2026-01-01 00:00:00 +0000
)"));
  device.run("prefs set com.norvane.zentrix.tavrel SSLastLoggedAt 2200-01-01T00:00:00Z --date");
  const auto document = device.json("nandlog show");
  EXPECT_EQ(document["next"], R"({
      "last_logged": "2200-01-01T00:00:00Z", "last_is_in_future": true, "allowed_now": false,
      "allowed_from": "2200-01-08T00:00:00Z"})"_json);
  EXPECT_EQ(document["log"]["date"], "2026-11-16 18:02:18 +0000");
  EXPECT_EQ(document["log"]["write_amplification"],
            R"({"UserWamp": 2.05, "IntermediateWamp": {"$real": "inf"}})"_json);
  EXPECT_EQ(document["log"]["others"]["odd:key"], "99999999999999999999");
  EXPECT_EQ(document["log"]["validity"], R"({"ValidityList[0]": [12, -1]})"_json);
  // A log without metadata is recognised by its name.
  const std::string named = outbox + "StorageStatus-9.log";
  for (const char* part : {"6T17", "6T18", "7T18"})
    std::filesystem::remove(outbox + part + ".log");
  device.write(kSubmission + "outbox/StorageStatus-9.log", "no log\n\nof the form");
  device.check("nandlog show",
               {1,
                "Next log        not before 2200-01-08 00:00:00 +0000: the last is dated "
                "2200-01-01 00:00:00 +0000, later than now; 'tavrelctl prefs delete "
                "com.norvane.zentrix.tavrel SSLastLoggedAt' lets the next run write one\n",
                "tavrelctl: not a NAND log: " + named +
                    ": 'tavrelctl log show StorageStatus-9.log' shows it\n"});
  std::filesystem::permissions(device.path(""), std::filesystem::perms{0755});
  const std::string preferences =
      device.path("/var/mobile/Library/Preferences/com.norvane.zentrix.tavrel.plist");
  std::filesystem::permissions(named, std::filesystem::perms::none);
  std::filesystem::permissions(preferences, std::filesystem::perms::none);
  const Outcome refused = device.runAsAnother("nandlog show");
  EXPECT_EQ(refused.out, "Next log        unknown\n");
  expectIn(refused.error, {"cannot read " + named + ": Permission denied"});
  expectIn(device.runAsAnother("nandlog show --json").out, {"\"next\": null"});
}

}  // namespace
}  // namespace tavrel
