#include "platform/submission.h"

#include <set>

#include "device_services.h"
#include "faulty_file_system.h"
#include "platform/linux/logs/file_submission.h"
#include "platform/linux/logs/json_line.h"
#include "platform/linux/logs/log_file_name.h"

namespace tavrel {
namespace {

using Place = FileSubmission::Place;

const std::string kContent(10'000, 'L');

struct Service : ProcessServices {
  Service(const DeviceRoot& root, FileSystem& fileSystem)
      : ProcessServices(root, fileSystem),
        version(root, fileSystem, coding, log),
        submission(root, fileSystem, coding, preferences, version, clock, log) {}
  explicit Service(const DeviceRoot& root)
      : ProcessServices(root),
        version(root, files, coding, log),
        submission(root, files, coding, preferences, version, clock, log) {}

  bool file(std::string_view name = "log-tallied", const plist::Dictionary& options = {}) {
    return submission.ZTXWriteLogForSubmission("193", name, options, [](LogFile& file) {
      file.write(asBytes(std::string_view(kContent).substr(0, 6000)));
      file.write(asBytes(std::string_view(kContent).substr(6000)));
    });
  }

  LinuxSystemVersion version;
  FileSubmission submission;
};

std::ptrdiff_t filesPending(const TemporaryRoot& device) {
  std::error_code missing;
  const fs::path folder = device.root.path("/var/mobile/Library/Logs/Submission/pending");
  return std::distance(fs::directory_iterator(folder, missing), {});
}

TEST(Submission, FilesALogWithItsMetadataAndSendsItOn) {
  const TemporaryRoot device;
  device.write("/etc/os-release", "NAME=\"Example OS\"\nVERSION_ID=4.2\nBUILD_ID=8N5\n");
  const std::string orphan = "/var/mobile/Library/Logs/Submission/pending/old.metadata.plist";
  device.write(orphan, "left by a process that was killed");
  fs::last_write_time(device.root.path(orphan),
                      fs::file_time_type::clock::now() - std::chrono::hours(25));
  Service service(device.root);
  ASSERT_TRUE(service.file("log-tallied", {{"previous_os_version", "<unknown>"}}));
  service.clock.time = plist::Date::since1970(1'795'802'600);
  ASSERT_TRUE(service.file("../Storage Status"));

  const auto logs = *service.submission.logs(Place::Pending);
  ASSERT_EQ(logs.size(), 2U);
  EXPECT_EQ(logs[0].name.substr(0, 29), "log-tallied-20261127T180218Z-");
  EXPECT_EQ(logs[1].name.substr(0, 36), "_.._Storage_Status-20261127T180320Z-");
  EXPECT_EQ(parseLogFileName(logs[0].name), (LogFileName{"log-tallied", 1'795'802'538}));
  for (const char* other : {"-20261127T180218Z-5f0c9a1e", "a-20261127T180218Z-5f0c9a1",
                            "a-20261327T180218Z-5f0c9a1e", "a-20261127T240218Z-5f0c9a1e",
                            "a-2026112_T180218Z-5f0c9a1e", "a_20261127T180218Z-5f0c9a1e"})
    EXPECT_FALSE(parseLogFileName(other)) << other;
  EXPECT_EQ(contentOf(logs[0].path), kContent);
  std::string metadata;
  appendJson(metadata, logs[0].metadata);
  EXPECT_EQ(
      metadata,
      R"j({"LogName":"log-tallied","LogType":"193","OSVersion":"Example OS 4.2 (8N5)",)j"
      R"j("Options":{"previous_os_version":"<unknown>"},"Time":"2026-11-27T18:02:18.000Z"})j");
  for (int time = 0; time < 2; ++time)
    service.submission.submitDiagnosticLogs();
  EXPECT_EQ(filesPending(device), 0);
  EXPECT_EQ(service.submission.logs(Place::Outbox)->size(), 2U);
  EXPECT_TRUE(service.log.lines.empty());
}

TEST(Submission, LogsAreWholeWithMetadataAfterEveryFault) {
  for (const auto fault : FaultyFileSystem::kFaults) {
    int call = 1;
    for (bool struck = true; struck; ++call) {
      SCOPED_TRACE(testing::Message() << "fault " << static_cast<int>(fault) << " at " << call);
      const TemporaryRoot device;
      FaultyFileSystem faulty(device.root.path("/"), fault, call);
      Service service(device.root, faulty);
      const bool filed = service.file();
      if (!filed) {
        ASSERT_FALSE(service.log.lines.empty());
        EXPECT_EQ(service.log.lines.back().find("cannot file log \"log-tallied\": cannot "), 0U);
        EXPECT_TRUE(!faulty.goesOn() || filesPending(device) == 0) << "nothing of it is left";
      }
      service.submission.submitDiagnosticLogs();
      struck = faulty.hasStruck();
      faulty.settle();

      Service after(device.root);
      std::set<std::string> names;
      for (const Place place : {Place::Pending, Place::Outbox}) {
        const auto logs = *after.submission.logs(place);
        for (const auto& log : logs) {
          EXPECT_EQ(contentOf(log.path), kContent);
          EXPECT_EQ(log.metadata.string("LogType"), "193");
          names.insert(log.name);
        }
      }
      EXPECT_TRUE(names.size() == 1 || (!filed && names.empty())) << "what was filed stays";

      EXPECT_TRUE(after.file());
      after.submission.submitDiagnosticLogs();
      EXPECT_EQ(after.submission.logs(Place::Pending)->size(), 0U);
      EXPECT_EQ(after.submission.logs(Place::Outbox)->size(), names.size() + 1);
      ASSERT_LT(call, 200);
    }
  }
}

}  // namespace
}  // namespace tavrel
