// docs/examples/read_log.py prints what the daemon files.
#include "daemon/daily_run.h"
#include "device.h"
#include "platform/linux/linux_platform.h"

namespace tavrel {
namespace {

TEST(ReadLogTest, PrintsALogOfTheDaemon) {
  const TemporaryDevice device;
  device.write(kWhitelistFile, xmlOf(R"({"Example": {
      "ScalarKeys": {"com.example.starts": {"sig_fig": 2}},
      "DistributionKeys": {"com.example.delay": {"intervals": [2.5, 10, 100]},
                           "com.example.load": {}}}})"));
  device.write("/etc/tavrel/system-version.plist", xmlOf(R"({"ProductName": "Pellio",
      "ProductVersion": "4.2", "ProductBuildVersion": "16R349"})"));
  device.write("/etc/locale.conf", "LANG=de_AT.UTF-8\n");
  device.write("/etc/tavrel/languages", "en\nde\n");
  const std::string preferences = "/var/mobile/Library/Preferences/com.norvane.";
  device.write(preferences + "tallied.tavrel.plist", xmlOf(R"({"TaskingID": "t-7",
      "TaskingPayload": [{"Domain": "com.example", "Key": "interval", "Value": 60}]})"));
  device.write(preferences + "zentrix.plist", xmlOf(R"({"DiagnosticSubmissionEnabled": true})"));
  std::string values = "scalar\t20781\tcom.example.starts\t12345\n";
  for (const char* value :
       {"delay\t0\t1", "delay\t0\t10", "delay\t0\t10.5", "delay\t0\t250", "load\t0\t0.25"})
    values += format("value\t20781\tcom.example.%s\n", value);
  device.check("stat import", prints("standard input: 1 scalar, 5 values\n"), values);
  LinuxPlatform linuxPlatform(device.root);
  dailyTasksForDay(
      linuxPlatform.platform(), 20781,
      plist::Array{plist::Dictionary{{"bundle", "com.example.walk"},
                                     {"version", "1.2"},
                                     {"uuid", "8D1F6C0E-55B5-4B0A-9C6B-0D1A53F3A1C2"}}});

  const std::string printed = device.path("/printed");
  const std::string command = "python3 " TAVREL_EXAMPLES "/read_log.py " +
                              device.path(kSubmission) + "pending/*.log > " + printed + " 2>&1";
  EXPECT_EQ(std::system(command.c_str()), 0);
  EXPECT_EQ(contentOf(printed), R"(2026-11-24  log-tallied, type 193
  Pellio 4.2 (16R349), {'previous_os_version': '<unknown>'}
  whitelist eb42570d2e2f7addc42403d203dafde4
  tasking t-7, settings [{'Domain': 'com.example', 'Key': 'interval', 'Value': 60}]
  BHPreferredUserInterfaceLanguage = de-AT
  BHUserInterfaceLanguage = de
  BHUserSetRegionFormat = AT
  com.example.starts = 12000
  com.example.delay: 4 from 1.0 to 250.0, mean 67.875, deviation 105.2
    (-inf, 2.5] 1
    (2.5, 10] 1
    (10, 100] 1
    (100, inf) 1
  com.example.load: 1 from 0.25 to 0.25, mean 0.25, deviation 0
  com.example.walk 1.2 8D1F6C0E-55B5-4B0A-9C6B-0D1A53F3A1C2
)");
}

}  // namespace
}  // namespace tavrel
