// docs/examples/read_log.py prints what the daemon files.
#include <cstdio>

#include "config/bh_config.h"
#include "daemon/daily_run.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/logs/file_submission.h"
#include "platform/linux/store/sqlite_batch.h"
#include "platform/linux/store/sqlite_store.h"
#include "platform/plist/xml.h"
#include "tests/platform/temporary_root.h"

namespace tavrel {
namespace {

using plist::Array;
using plist::Dictionary;

std::string outputOf(const std::string& command) {
  std::FILE* const pipe = ::popen((command + " 2>&1").c_str(), "r");
  std::string output;
  for (int byte; (byte = std::fgetc(pipe)) != EOF;)
    output += static_cast<char>(byte);
  EXPECT_EQ(::pclose(pipe), 0);
  return output;
}

TEST(ReadLogTest, PrintsALogOfTheDaemon) {
  const TemporaryRoot folder;
  const auto write = [&](std::string_view path, const plist::Value& content) {
    folder.write(path, *plist::writeXml(content));
  };
  const Dictionary scalars{{"com.example.starts", Dictionary{{"sig_fig", 2}}}};
  const Dictionary distributions{
      {"com.example.delay", Dictionary{{"intervals", Array{2.5, 10, 100}}}},
      {"com.example.load", Dictionary::create()}};
  write(kWhitelistPath, Dictionary{{"Example", Dictionary{{"ScalarKeys", scalars},
                                                          {"DistributionKeys", distributions}}}});
  write("/etc/tavrel/system-version.plist", Dictionary{{"ProductName", "Pellio"},
                                                       {"ProductVersion", "4.2"},
                                                       {"ProductBuildVersion", "16R349"}});
  folder.write("/etc/locale.conf", "LANG=de_AT.UTF-8\n");
  folder.write("/etc/tavrel/languages", "en\nde\n");
  const Dictionary setting{{"Domain", "com.example"}, {"Key", "interval"}, {"Value", 60}};
  write("/var/mobile/Library/Preferences/com.norvane.tallied.tavrel.plist",
        Dictionary{{"TaskingID", "t-7"}, {"TaskingPayload", Array{setting}}});
  write("/var/mobile/Library/Preferences/com.norvane.zentrix.plist",
        Dictionary{{"DiagnosticSubmissionEnabled", true}});

  constexpr std::int32_t kDay = 20781;
  LinuxPlatform device(folder.root);
  const auto batch = device.store().beginBatch();
  ASSERT_TRUE(batch);
  EXPECT_TRUE((*batch)->setScalar(kDay, "com.example.starts", 12345));
  for (const double value : {1.0, 10.0, 10.5, 250.0})
    EXPECT_TRUE((*batch)->appendValue(kDay, "com.example.delay", 0, value));
  EXPECT_TRUE((*batch)->appendValue(kDay, "com.example.load", 0, 0.25));
  EXPECT_TRUE((*batch)->commit());
  const Dictionary app{{"bundle", "com.example.walk"},
                       {"version", "1.2"},
                       {"uuid", "8D1F6C0E-55B5-4B0A-9C6B-0D1A53F3A1C2"}};
  dailyTasksForDay(device.platform(), kDay, Array{app});

  const auto logs = device.submission().logs(FileSubmission::Place::Pending);
  ASSERT_TRUE(logs && logs->size() == 1U);
  EXPECT_EQ(outputOf("python3 " TAVREL_EXAMPLES "/read_log.py " + logs->front().path),
            R"(2026-11-24  log-tallied, type 193
  Pellio 4.2 (16R349), {'previous_os_version': '<unknown>'}
  whitelist eb42570d2e2f7addc42403d203dafde4, tasking t-7
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
  set com.example interval = 60
  com.example.walk 1.2 8D1F6C0E-55B5-4B0A-9C6B-0D1A53F3A1C2
)");
}

}  // namespace
}  // namespace tavrel
