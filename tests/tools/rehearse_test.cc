// tavrelctl rehearse, on a device that has something for every step.
#include <regex>
#include <set>

#include "device.h"

namespace tavrel {
namespace {

// Statistics with a write amplification of 2.56, a validity list of two records, and two defects.
constexpr const char* kDriver = R"({"Services": [{
  "Class": "ASPStorage",
  "Properties": {"Device Characteristics": {"vendor-name": "Example"}},
  "Methods": [
    {"Method": 8, "Selector": 13, "Flags": 1, "Output": {"$data": "UAAAAA=="}},
    {"Method": 8, "Selector": 13, "Output": {"$data": "BAAAAAEAAADoAwAAAAAAABQAAAABAAAACgAAAAAAAAAxAAAAAQAAAAAQAAAAAAAAMgAAAAEAAAAAAQAAAAAAADUAAAABAAAABQAAAAAAAAA="}},
    {"Method": 8, "Selector": 11, "Flags": 1, "Output": {"$data": "NAAAAA=="}},
    {"Method": 8, "Selector": 11, "Output": {"$data": "AgAAAAAAAAAAAAAAAwAAAP////8AAAAAAAAAAAAAAAAAAAAADAAAAAAAAAAAAAAAAAAAAA=="}},
    {"Method": 8, "Selector": 15, "Flags": 1, "Output": {"$data": "RAAAAA=="}},
    {"Method": 8, "Selector": 15, "Output": {"$data": "AAAAAAcAAAACAAAAAAABAAIAAAADAAAABAAAAAUAAAAGAAAA7AAAAAEAAQACAAAAAwAAAAQAAAAFAAAABgAAAOwAAAA="}}
  ]}]})";

struct Rehearsed : TemporaryDevice {
  Rehearsed() {
    write(kWhitelistFile, xmlOf(R"({"G": {"ScalarKeys": {"app.starts": {}}}})"));
    write("/var/lib/tavrel/registry/storage.plist", xmlOf(kDriver));
    write("/var/lib/tavrel/ecc-events/1.event", "\x05" + std::string(71, '\0'));
    write("/var/lib/tavrel/ecc-events/2.errno", "16");
    write("/var/lib/tavrel/ecc-events/3.event", "\x05" + std::string(71, '\0'));
    write("/sys/devices/system/edac/mc/mc0/ce_count", "1\n");
    write("/etc/tavrel/device-answers.plist",
          xmlOf(R"({"DiskUsage": {"TotalDiskCapacity": 1048576}, "InverseDeviceID": "d4"})"));
    write("/etc/tavrel/system-version.plist", xmlOf(R"({"ProductBuildVersion": "8B"})"));
    write("/etc/tavrel/languages", "en\n");
    write("/etc/locale.conf", "LANG=de_AT.UTF-8\n");
    write("/etc/machine-id", "0123456789abcdef0123456789abcdef\n");
    write("/sys/firmware/devicetree/base/model", "Board\n");
    write("/var/lib/dpkg/status", "Package: a\nStatus: install ok installed\nArchitecture: all\n");
    const std::string records = "/var/mobile/Library/Logs/CrashReporter/StructuredData/172-";
    for (int day = 1; day <= 31; ++day)
      write(records + format("2026-01-%02d.jsonl", day), "");
    write(records + "1999-01-01.jsonl", "");
    run("stat set app.starts 5");
    run("prefs set com.norvane.zentrix DiagnosticSubmissionEnabled true --bool");
    today = json("status")["today"];
  }

  /// The text of a rehearsal, masking whatever differs between machines and days.
  std::string text(const std::string& options) const {
    const Outcome outcome = run("rehearse" + options);
    EXPECT_EQ(outcome.status, 0) << outcome;
    EXPECT_EQ(outcome.error, "");
    const auto day = today["day"].get<std::int32_t>();
    std::string text = outcome.out;
    const auto replace = [&text](const std::string& what, const char* mask) {
      text = std::regex_replace(text, std::regex(what), mask);
    };
    replace(std::to_string(day), "TODAY");
    replace(std::to_string(day - 1), "YESTERDAY");
    replace("DAY \\([-0-9]+\\)", "DAY (DATE)");
    replace(" \\([0-9]+ times\\)", "");
    replace("type 165, [0-9]+ bytes", "type 165, N bytes");
    replace("SSLastLoggedAt = [-+: 0-9]+", "SSLastLoggedAt = NOW");
    replace("system identifier: \"[-0-9A-F]+\"", "system identifier: \"ID\"");
    return text;
  }

  nlohmann::json today;
};

// Removes events that differ from an earlier one only in names and values.
std::string firstOfEachKind(const std::string& text) {
  std::set<std::string> kinds;
  std::string kept;
  std::istringstream lines(text);
  for (std::string line; std::getline(lines, line);) {
    std::string kind;
    std::istringstream words(line);
    for (std::string word; words >> word;)
      kind += word.find_first_not_of("abcdefghijklmnopqrstuvwxyz:") == word.npos ? word + ' ' : "";
    if (!line.starts_with(' ') || kinds.insert(kind).second) kept += line + '\n';
  }
  return kept;
}

constexpr const char* kToday =
    R"text(Rehearsal of the forced run for day TODAY (DATE). Nothing is changed.

Daily tasks
  logs default: daily tasks for day TODAY

Checkpoint of the statistics store
  would checkpoint the statistics store

Report
  reads preference com.norvane.zentrix DiagnosticSubmissionEnabled: true
  reads preference com.norvane.zentrix DiagnosticSubmissionFirstDay: none
  asks the device InternalBuild: none
  reads file /Library/Application Support/Brimhold/Whitelist_Pellio.plist: 195 bytes
  logs info: writing tallied log. yesterday=TODAY
  reads scalars of day TODAY: 1 row
  reads distributions of day TODAY: 0 rows
  reads preferred languages: ["de-AT"]
  reads languages of the system: ["en"]
  reads country: "AT"
  reads OS version: "(8B)"
  would set preference com.norvane.tallied.tavrel LastOSVersion = "(8B)"
  would write preferences of com.norvane.tallied.tavrel
  would submit log-tallied, type 193, 888 bytes, options {"previous_os_version": "<unknown>"}

Disk space
  asks the device DiskUsage: {"TotalDiskCapacity": 1048576}
  would set scalar com.norvane.lumenhall.DiskUsageUserTotalBlocks = 1

Structured storage log and NAND information
  looks for driver ASPStorage: found
  calls driver ASPStorage open: opened
  calls driver ASPStorage method 8: 4 bytes
  reads property ASPStorage Device Characteristics: a dictionary
  reads system identifier: "ID"
  reads hardware model: "Board"
  would submit StorageStatus, type 165, N bytes
  calls driver ASPStorage method 8: failed with 0xe00002c2
  prints on standard error: "IOConnectCallStructMethod failed with status 0xe00002c2 on selector index 1\n"
  would file 3 records of type 176
  would set scalar: 8 more

ECC events
  reads control kern.next_ecc_event: <050000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000>
  would file 1 record of type 172
  reads control kern.next_ecc_event: error 16, Device or resource busy

Report channels
  looks for drivers {"IOPropertyMatch": {"IOReportLegendPublic": true}}: answered

Clean-up of structured records
  would remove old files of structured records: ["172-1999-01-01.jsonl"]

OS changes and tasking
  reads system version: {"ProductBuildVersion": "8B"}
  logs default: OS change since last run ((null) -> 8B)

Roll-over of the support log
  would roll nothing: the support log is empty or missing

In total it would write: 3 preferences, 17 scalars, 4 structured records, 2 logs
--verbose shows everything, with the content of logs.
It would file a log for day TODAY (DATE)
)text";

TEST(Rehearse, TellsEveryStepAndChangesNothing) {
  const Rehearsed device;
  const auto before = device.files();
  EXPECT_EQ(firstOfEachKind(device.text(" --today")), kToday);
  EXPECT_EQ(device.files(), before);

  const auto document = device.json("rehearse --forced");
  EXPECT_EQ(document["run"], "forced");
  EXPECT_EQ(document["log_outcome"], "nothing-to-report");
  EXPECT_EQ(document["totals"], R"({"set_preference": 2, "set_scalar": 17,
                                                         "file_record": 4, "submit_log": 1})"_json);
  EXPECT_EQ(document["steps"][3]["events"][0], R"({
      "event": "ask_device", "subject": "DiskUsage", "value": {"TotalDiskCapacity": 1048576}})"_json);
  EXPECT_EQ(device.files(), before);

  const std::string verbose = device.text(" --today -v");
  expectIn(verbose,
           {"\n    |     <key>app.starts</key>\n", "\n    | Hardware Model: Board\n",
            " +0000 tavrel[", "\n  would file record of type 176: {\"Factory Count\": 7}\n"});
}

TEST(Rehearse, GatedRunStopsWhereItsDayIsDone) {
  const Rehearsed device;
  expectIn(device.text(""), {R"(
Roll-over of the support log
  would roll nothing: the support log is empty or missing

End of the gated run
  would checkpoint the statistics store
  reads preference com.norvane.tallied.tavrel LastLogOutcome: none
  would set preference com.norvane.tallied.tavrel LastLogOutcome = "nothing-to-report"
  would set preference com.norvane.tallied.tavrel LastCrashLogSerializationDateInDaysSince1970 = YESTERDAY
  would write preferences of com.norvane.tallied.tavrel

In total it would write: 4 preferences,)"});
  device.run("prefs set com.norvane.tallied.tavrel LastCrashLogSerializationDateInDaysSince1970 " +
             device.today["day"].dump() + " --int");
  EXPECT_EQ(device.text(""),
            R"(Rehearsal of the gated run for day YESTERDAY (DATE). Nothing is changed.

Once-a-day gate
  reads preference com.norvane.tallied.tavrel LastCrashLogSerializationDateInDaysSince1970: TODAY
  logs default: Day unchanged since last run

In total it would write: nothing
It would file no log: the run for day YESTERDAY (DATE) is already done
)");
}

TEST(Rehearse, SaysWhyNothingIsSentOn) {
  const Rehearsed device;
  device.write("/tasking.plist", xmlOf(R"({"TaskingID": "t"})"));
  device.run("prefs set com.norvane.Drovelink ScheduledTasking @" + device.path("/tasking.plist") +
             " --plist");
  device.run("prefs set com.norvane.da AggressiveSubmissionDays 3 --int");
  const auto sentOn = [&device] {
    const std::string out = device.run("rehearse --today").out;
    const std::size_t at = out.find("  would send on ");
    return at == std::string::npos ? out : out.substr(at, out.find('\n', at) - at);
  };
  EXPECT_EQ(sentOn(), "  would send on the pending logs");
  const std::string kPermission = "/var/mobile/Library/Preferences/com.norvane.zentrix.plist";
  device.write(kPermission, "damaged");
  EXPECT_EQ(
      sentOn().find("  would send on nothing: cannot read preferences " + device.path(kPermission)),
      0U)
      << sentOn();
  device.run("deny");
  EXPECT_EQ(sentOn(), "  would send on nothing: submission is not allowed");
}

TEST(Rehearse, CountsTheLogsThatAWithdrawalLeftBehind) {
  const Rehearsed device;
  const std::string pending = "/var/mobile/Library/Logs/Submission/pending/log-tallied-2026-11-2";
  for (const char* name : {"4-1.log", "5-1.log"})
    device.write(pending + name, "");
  const std::string line = "\n  would remove logs that wait without permission: 2\n";
  EXPECT_EQ(device.text(" --today").find(line), std::string::npos);
  device.run("prefs set com.norvane.zentrix DiagnosticSubmissionEnabled false --bool");
  expectIn(device.text(" --today"), {line});
}

}  // namespace
}  // namespace tavrel
