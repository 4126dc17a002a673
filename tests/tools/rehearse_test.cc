// tavrelctl rehearse, over a device that has something for every step.
#include <nlohmann/json.hpp>
#include <regex>

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
    write("/var/mobile/Library/Logs/CrashReporter/StructuredData/172-1999-01-01.jsonl", "");
    run({"stat", "set", "app.starts", "5"});
    run({"prefs", "set", "com.norvane.zentrix", "DiagnosticSubmissionEnabled", "true", "--bool"});
    today = nlohmann::json::parse(run({"status", "--json"}).out)["today"];
  }

  /// The text of a rehearsal, with what differs from one machine and day to another masked.
  std::string text(std::vector<std::string> options) const {
    options.insert(options.begin(), "rehearse");
    const Outcome outcome = run(options);
    EXPECT_EQ(outcome.status, 0) << outcome;
    EXPECT_EQ(outcome.error, "");
    const auto day = today["day"].get<std::int32_t>();
    std::string text = outcome.out;
    for (const auto& [what, mask] :
         {std::pair(std::to_string(day) + " \\([-0-9]+\\)", "TODAY (DATE)"),
          std::pair(std::to_string(day), "TODAY"),
          std::pair(std::to_string(day - 1) + " \\([-0-9]+\\)", "YESTERDAY (DATE)"),
          std::pair(std::to_string(day - 1), "YESTERDAY"),
          std::pair(std::string(" \\([0-9]+ times\\)"), ""),
          std::pair(std::string("type 165, [0-9]+ bytes"), "type 165, N bytes"),
          std::pair(std::string("SSLastLoggedAt = [-+: 0-9]+"), "SSLastLoggedAt = NOW"),
          std::pair(std::string("reads system identifier: \"[-0-9A-F]+\""),
                    "reads system identifier: \"ID\"")}) {
      text = std::regex_replace(text, std::regex(what), mask);
    }
    return text;
  }

  nlohmann::json today;
};

constexpr const char* kToday =
    R"text(Rehearsal of the forced run for day TODAY (DATE). Nothing is changed.

Daily tasks
  logs default: daily tasks for day TODAY

Checkpoint of the statistics store
  would checkpoint the statistics store

Report
  reads preference com.norvane.zentrix DiagnosticSubmissionEnabled: true
  asks the device InternalBuild: none
  reads file /Library/Application Support/Brimhold/Whitelist_Pellio.plist: 195 bytes
  reads preference com.norvane.da G: none
  logs info: writing tallied log. yesterday=TODAY
  reads scalars of day TODAY: 1 row
  reads distributions of day TODAY: 0 rows
  reads preferred languages: ["de-AT"]
  reads languages of the system: ["en"]
  reads country: "AT"
  reads preference com.norvane.tallied.tavrel TaskingID: none
  reads preference com.norvane.tallied.tavrel TaskingDigest: none
  reads preference com.norvane.tallied.tavrel TaskingPayload: none
  reads preference com.norvane.tallied.tavrel LastOSVersion: none
  reads OS version: "(8B)"
  would set preference com.norvane.tallied.tavrel LastOSVersion = "(8B)"
  would write preferences of com.norvane.tallied.tavrel
  reads preference com.norvane.zentrix com.norvane.zentrix.tallied.tavrel: none
  would submit log-tallied, type 193, 888 bytes, options {"previous_os_version": "<unknown>"}

Disk space
  asks the device DiskUsage: {"TotalDiskCapacity": 1048576}
  would set scalar com.norvane.lumenhall.DiskUsageUserTotalBlocks = 1
  would set scalar com.norvane.lumenhall.DiskUsageUserBlocksFree = -1

Structured storage log and NAND information
  looks for driver ASPStorage: found
  calls driver ASPStorage open: opened
  calls driver ASPStorage method 8: 4 bytes
  calls driver ASPStorage method 8: 80 bytes
  reads preference com.norvane.NANDInfo userWAmp: none
  reads property ASPStorage Device Characteristics: a dictionary
  calls driver ASPStorage method 8: 52 bytes
  reads preference com.norvane.zentrix.tavrel SSLastLoggedAt: none
  reads system identifier: "ID"
  reads hardware model: "Board"
  reads OS version: "(8B)"
  asks the device InverseDeviceID: "d4"
  would submit StorageStatus, type 165, N bytes
  would set preference com.norvane.zentrix.tavrel SSLastLoggedAt = NOW
  would write preferences of com.norvane.zentrix.tavrel
  calls driver ASPStorage method 8: failed with 0xe00002c2
  prints on standard error: "IOConnectCallStructMethod failed with status 0xe00002c2 on selector index 1\n"
  prints on standard error: "IOConnectCallStructMethod failed with status 0xe00002c2 on selector index 2\n"
  prints on standard error: "IOConnectCallStructMethod failed with status 0xe00002c2 on selector index 3\n"
  calls driver ASPStorage method 8: 68 bytes
  would file 3 records of type 176
  reads preference com.norvane.demo-settings StoreDemoMode: none
  would set scalar com.norvane.NANDInfo.ExportVersion = 5
  would set scalar com.norvane.NANDInfo.DriverVersion = -1
  would set scalar com.norvane.NANDInfo.DemoMode = 0
  would set scalar com.norvane.NANDInfo.NumVirtualBlocks = 0
  would set scalar com.norvane.NANDInfo.PagesPerVirtualBlock = 256
  would set scalar com.norvane.NANDInfo.BytesPerPage = 4096
  would set scalar com.norvane.NANDInfo.NumLogicalReads = 0
  would set scalar: 8 more

ECC events
  reads control kern.next_ecc_event: <050000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000000>
  would file 1 record of type 172
  reads control kern.next_ecc_event: error 16, Device or resource busy

Report channels
  looks for drivers {"IOPropertyMatch": {"IOReportLegendPublic": true}}: answered

Clean-up of structured records
  would remove files of old structured records: ["172-1999-01-01.jsonl"]

Changes of the system, and tasking
  reads system version: {"ProductBuildVersion": "8B"}
  reads preference com.norvane.tallied.tavrel LastOSUpdate: none
  logs default: OS change since last run ((null) -> 8B)
  would set preference com.norvane.tallied.tavrel LastOSUpdate = {"day": TODAY, "version": "8B"}
  reads preference com.norvane.Drovelink ScheduledTasking: none

Roll-over of the support log
  would roll nothing: the support log is empty or not there

In all it would write: 3 preferences, 17 scalars, 4 structured records, 2 logs
--verbose shows everything, and what logs hold.
It would file a log for day TODAY (DATE)
)text";

TEST(Rehearse, TellsEveryStepAndChangesNothing) {
  const Rehearsed device;
  const auto before = device.files();
  EXPECT_EQ(device.text({"--today"}), kToday);
  EXPECT_EQ(device.files(), before);

  const Outcome json = device.run({"rehearse", "--forced", "--json"});
  const auto document = nlohmann::json::parse(json.out, nullptr, false);
  EXPECT_EQ(document["run"], "forced");
  EXPECT_EQ(document["log_outcome"], "nothing-to-report");
  EXPECT_EQ(document["totals"], nlohmann::json::parse(R"({"set_preference": 2, "set_scalar": 17,
                                                         "file_record": 4, "submit_log": 1})"));
  EXPECT_EQ(document["steps"][3]["events"][0], nlohmann::json::parse(R"({
      "event": "ask_device", "subject": "DiskUsage", "value": {"TotalDiskCapacity": 1048576}})"));
  EXPECT_EQ(device.files(), before);

  const std::string verbose = device.text({"--today", "-v"});
  for (const char* line : {"\n    |     <key>app.starts</key>\n", "\n    | Hardware Model: Board\n",
                           "\n  would file record of type 176: {\"Factory Count\": 7}\n"}) {
    EXPECT_NE(verbose.find(line), std::string::npos) << line << verbose;
  }
}

TEST(Rehearse, GatedRunStopsWhereItsDayIsDone) {
  const Rehearsed device;
  EXPECT_NE(device.text({}).find(R"(
Roll-over of the support log
  would roll nothing: the support log is empty or not there

End of the gated run
  would checkpoint the statistics store
  reads preference com.norvane.tallied.tavrel LastLogOutcome: none
  would set preference com.norvane.tallied.tavrel LastLogOutcome = "nothing-to-report"
  would set preference com.norvane.tallied.tavrel LastCrashLogSerializationDateInDaysSince1970 = YESTERDAY
  would write preferences of com.norvane.tallied.tavrel

In all it would write: 4 preferences,)"),
            std::string::npos);
  device.run({"prefs", "set", "com.norvane.tallied.tavrel",
              "LastCrashLogSerializationDateInDaysSince1970",
              std::to_string(device.today["day"].get<int>()), "--int"});
  EXPECT_EQ(device.text({}),
            R"(Rehearsal of the gated run for day YESTERDAY (DATE). Nothing is changed.

Once-a-day gate
  reads preference com.norvane.tallied.tavrel LastCrashLogSerializationDateInDaysSince1970: TODAY
  logs default: Day unchanged since last run

In all it would write: nothing
It would file no log: the run for day YESTERDAY (DATE) is done
)");
}

}  // namespace
}  // namespace tavrel
