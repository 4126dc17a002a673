// The locks with which programs take turns: no other user can hold one of them.

#include <grp.h>
#include <signal.h>
#include <sys/file.h>

#include "faulty_file_system.h"
#include "platform/linux/device/ecc_events.h"
#include "platform/linux/folding/segment_fold.h"
#include "platform/linux/limits/tidy.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/logs/file_crash_reporting.h"
#include "platform/linux/logs/file_submission.h"
#include "platform/platform.h"
#include "tests/devices/device_services.h"

namespace tavrel {
namespace {

constexpr uid_t kNobody = 65534;
const std::string kSubmission = "/var/mobile/Library/Logs/Submission";
const std::string kStoreFolder = "/var/mobile/Library/Brimhold";
const std::string kSegments = "/run/tavrel/stat";
const std::string kEvents = "/var/lib/tavrel/ecc-events";
const std::string kRecords = "/var/mobile/Library/Logs/CrashReporter/StructuredData";

struct LockTest : testing::Test, DeviceServices {};

/// A process of another user that locks whatever it can open, until the test ends.
class Hinderer {
 public:
  explicit Hinderer(const Lines& paths) {
    int ready[2];
    EXPECT_EQ(pipe(ready), 0);
    child_ = fork();
    if (child_ == 0) {
      bool isDone = setgroups(0, nullptr) + setgid(kNobody) + setuid(kNobody) == 0;
      for (const std::string& path : paths)
        isDone = isDone && flock(open(path.c_str(), O_RDONLY), LOCK_EX | LOCK_NB) == 0;
      if (!isDone || ::write(ready[1], "x", 1) != 1) _exit(1);
      pause();
    }
    close(ready[1]);
    char byte = 0;
    EXPECT_EQ(::read(ready[0], &byte, 1), 1) << "not everything was locked";
    close(ready[0]);
  }
  ~Hinderer() {
    kill(child_, SIGKILL);
    waitpid(child_, nullptr, 0);
  }

 private:
  pid_t child_;
};

TEST_F(LockTest, AnotherUserHindersNoProgram) {
  if (geteuid() != 0) GTEST_SKIP() << "only root can become another user";
  ASSERT_EQ(chmod(root.path("/").c_str(), 0755), 0);
  const std::string events = root.path(kEvents);
  const auto count = [](const std::string& folder) {
    return std::distance(fs::directory_iterator(folder), {});
  };
  write("/etc/tavrel/limits.plist",
        *coding.encodeXml(plist::Dictionary{{"EccEvents", plist::Dictionary{{"Bytes", 65536}}}}));
  for (int i = 10; i < 28; ++i)
    write(kEvents + "/" + std::to_string(i) + ".event", std::string(kEccEventBytes, 'e'));
  for (const std::string& folder : {kSegments, kSubmission, kStoreFolder})
    fs::create_directories(root.path(folder));
  const std::string records = kRecords + "/176-2026-11-27.jsonl";
  write(records, "");  // a group may be allowed to read it
  const Hinderer hinderer({root.path("/"), root.path("/run/tavrel"), root.path(kSegments),
                           root.path(kSubmission), root.path(kStoreFolder), events,
                           root.path(kRecords), root.path(records)});

  LinuxPlatform device(root, {.log = &log});
  Platform& platform = device.platform();
  device.preferences().ZTXPreferencesSetValue("DiagnosticSubmissionEnabled", true,
                                              "com.norvane.zentrix");
  device.preferences().ZTXPreferencesSynchronize("com.norvane.zentrix");
  platform.statistics->BHClientSetValueForScalarKey("k", 1);
  EXPECT_TRUE(device.store().commit());
  const FoldReport fold = device.fold().run();
  EXPECT_TRUE(fold.hasFolder);
  EXPECT_EQ(fold.failure, std::nullopt);
  platform.statistics->initWithDefaultPath()->scalarsForKeyPrefix("", 20782, 20783,
                                                                  [](auto, auto, auto, auto&) {});
  EXPECT_TRUE(platform.submission->ZTXWriteLogForSubmission(
      "193", "log-tallied", {}, [](LogFile& file) { file.write(asBytes("x")); }));
  platform.submission->submitDiagnosticLogs();
  EXPECT_EQ(count(root.path(kSubmission + "/outbox")), 2);
  EXPECT_EQ(device.submission().removeWaiting().logs, 1U);

  EXPECT_EQ(Tidy(root, files, coding, platform.preferences, device.store()).run().failures,
            Lines{});
  std::array<std::byte, kEccEventBytes> buffer{};
  EccEvents queue(root, files, coding, log, EccEvents::Mode::Consume);
  EXPECT_EQ(queue.next(buffer).errorNumber, 0);
  queue.filed();
  LinuxSystemVersion version(root, files, coding, log);
  FileCrashReporting(root, files, version, queue, clock, log).FLLogStructuredData(176, {{"k", 1}});
  EXPECT_EQ(contentOf(root.path(records)),
            R"({"time":"2026-11-27T18:02:18.250Z","type":176,"record":{"k":1}})"
            "\n");
  EXPECT_EQ(count(events), 16) << "two were beyond the limit, one was read; one is the lock's";
  EXPECT_EQ(log.lines, Lines{});
  for (const std::string& folder :
       {std::string("/run/tavrel"), kSubmission, kStoreFolder, kEvents, kRecords})
    EXPECT_EQ(FileSystem::status(root.path(folder + "/.lock"))->st_mode, S_IFREG | 0600) << folder;
}

TEST_F(LockTest, TheFileIsRefusedWhenAnotherUserMayHavePutItThere) {
  const std::string folder = root.path("/f");
  const std::string lock = folder + "/.lock";
  fs::create_directory(folder);
  const auto message = [&](FileSystem& system) {
    const auto locked = system.lockFolder(folder);
    return locked ? std::string() : locked.error().message;
  };
  EXPECT_EQ(message(files), "");
  ASSERT_EQ(chmod(lock.c_str(), 0644), 0);
  EXPECT_EQ(message(files), "");
  EXPECT_EQ(FileSystem::status(lock)->st_mode, S_IFREG | 0600);
  if (geteuid() == 0) {
    ASSERT_EQ(chown(lock.c_str(), kNobody, kNobody), 0);
    EXPECT_EQ(message(files), "") << "the uploader has a user of its own";
    ASSERT_EQ(chmod(folder.c_str(), 0777), 0);
    EXPECT_EQ(message(files),
              "cannot lock " + lock +
                  ": user 65534 owns it; remove it, and do not let all users write to its folder");
  }
  fs::remove(lock);
  FaultyFileSystem full(folder, FaultyFileSystem::Fault::Failure, 1);
  EXPECT_EQ(message(full), "") << "without room for the file the folder is locked";
  EXPECT_FALSE(fs::exists(lock));

  fs::create_symlink(root.path("/elsewhere"), lock);
  const std::string refusal = "cannot use " + lock + ": it is a symbolic link; move it away";
  EXPECT_EQ(message(files), refusal);
  EXPECT_EQ(files.lockFile(lock).error().message, refusal);
  EXPECT_EQ(files.openToAppend(lock, 0640).error().message, refusal);
  EXPECT_FALSE(fs::exists(root.path("/elsewhere")));
  fs::remove(lock);
  ASSERT_EQ(mkfifo(lock.c_str(), 0600), 0);
  EXPECT_EQ(message(files), "cannot use " + lock + ": it is not a regular file; move it away");
}

}  // namespace
}  // namespace tavrel
