// The daemon as a process, on a separate device.
#include <array>
#include <sstream>

#include "child_process.h"
#include "config/bh_config.h"
#include "daemon/app_info_listener.h"
#include "daemon/entry.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/logs/file_submission.h"
#include "platform/linux/runs/last_run.h"
#include "platform/linux/service/file_notifications.h"
#include "platform/linux/service/service_client.h"
#include "platform/linux/service/service_socket.h"
#include "platform/linux/store/sqlite_batch.h"
#include "platform/linux/store/sqlite_store.h"
#include "platform/persisted_state.h"
#include "platform/plist/xml.h"
#include "tests/devices/temporary_root.h"
#include "tests/helpers/plist_matching.h"

namespace tavrel {
namespace {

using plist::Array;
using plist::Dictionary;

/// Runs the daemon in this process.
void runDaemon(const DeviceRoot& root, const char* argument) {
  LinuxPlatform linuxPlatform(root);
  const std::array<const char*, 2> arguments{"tavrel", argument};
  runTavrel(linuxPlatform.platform(), arguments);
}

/// What a program logged, without the times.
std::string loggedIn(const std::string& errors) {
  std::istringstream lines(contentOf(errors));
  std::string log;
  for (std::string line; std::getline(lines, line);)
    log += line.substr(line.find(' ') + 1) + '\n';
  return log;
}

/// Runs the built program and returns what it logged.
std::string logBelow(const std::string& root, const char* argument, const std::string& errors) {
  EXPECT_EQ(waitFor(forkProcess([&] { executeBelow(root, argument); }, errors)), 0);
  return loggedIn(errors);
}

constexpr int kEccEvents = 3;

/// A device with permission, a whitelist, a scheduled tasking and yesterday's statistics, a storage
/// driver, report channels and memory errors.
struct Device : TemporaryRoot {
  std::int32_t yesterday = 0;

  Device() {
    const Dictionary keys{{"k", Dictionary::create()}};
    write(kWhitelistPath,
          *plist::writeXml(
              Dictionary{{"g", Dictionary{{"ScalarKeys", keys}, {"DistributionKeys", keys}}}}));
    for (const char* recording : {"report.plist", "storage.plist"}) {
      write(std::string("/var/lib/tavrel/registry/") + recording,
            contentOf(std::string(TAVREL_EXAMPLES "/registry/") + recording));
    }
    for (int i = 0; i < kEccEvents; ++i) {
      std::string event(72, '\0');
      event[0] = static_cast<char>(i);
      write(format("/var/lib/tavrel/ecc-events/%d.event", i), event);
    }
    write("/sys/devices/system/edac/mc/mc0/ce_count", "0\n");
    LinuxPlatform linuxPlatform(root);
    Platform& platform = linuxPlatform.platform();
    linuxPlatform.preferences().ZTXPreferencesSetValue("DiagnosticSubmissionEnabled", true,
                                                       "com.norvane.zentrix");
    const Dictionary setting{{"Domain", "com.example"}, {"Key", "k"}, {"Value", 7}};
    // Only the owner grants or withdraws the permission.
    const Dictionary withdrawal{{"Domain", "com.norvane.zentrix"},
                                {"Key", "DiagnosticSubmissionEnabled"}};
    platform.preferences->ZTXPreferencesSetValue(
        kScheduledTaskingKey,
        Dictionary{{"TaskingID", "t"}, {"TaskingPayload", Array{setting, withdrawal}}},
        kScheduleDomain);
    yesterday = platform.statistics->BHDaysSince1970() - 1;
    auto batch = linuxPlatform.store().beginBatch();
    static_cast<void>((*batch)->setScalar(yesterday, "k", 42));
    for (int i = 0; i < 3000; ++i)
      static_cast<void>((*batch)->appendValue(yesterday, "k", 0, i));
    EXPECT_TRUE((*batch)->commit());
  }

  /// The pending daily logs, which must be whole and have metadata; so must NAND logs.
  std::vector<Dictionary> pendingLogs() const {
    LinuxPlatform linuxPlatform(root);
    const auto filed = linuxPlatform.submission().logs(FileSubmission::Place::Pending);
    EXPECT_TRUE(filed);
    std::vector<Dictionary> logs;
    for (const auto& log : *filed) {
      if (log.metadata.string(kLogMetadataType) == "165") {
        const std::string text = contentOf(log.path);
        EXPECT_TRUE(text.starts_with("System ID: ") && text.ends_with("\n")) << log.path;
        continue;
      }
      EXPECT_EQ(log.metadata.string(kLogMetadataType), "193") << log.path;
      const auto document = plist::readXml(asBytes(contentOf(log.path)));
      EXPECT_TRUE(document) << log.path;
      if (!document) continue;
      EXPECT_EQ(document->dictionary().get("BHScalars"), plist::Value(Dictionary{{"k", 42}}));
      EXPECT_EQ(document->dictionary().dictionary("BHDistributions").array("k").at(4),
                plist::Value(3000));
      logs.push_back(document->dictionary());
    }
    return logs;
  }

  /// The ECC events filed as records, which must be whole lines, plus those that wait.
  int eccEvents() const {
    int count = 0;
    for (const auto& entry : std::filesystem::recursive_directory_iterator(root.path("/var"))) {
      const std::string name = entry.path().filename();
      if (name.ends_with(".event")) ++count;
      if (!name.ends_with(".jsonl")) continue;
      const std::string content = contentOf(entry.path());
      EXPECT_TRUE(content.empty() || content.ends_with("}}\n")) << name;
      std::istringstream lines(content);
      for (std::string line; std::getline(lines, line);)
        EXPECT_TRUE(line.starts_with("{\"time\":\"") && line.ends_with("}}")) << line;
      if (name.starts_with("172-")) count += static_cast<int>(std::ranges::count(content, '\n'));
    }
    return count;
  }

  /// The values of yesterday and today.
  std::vector<std::int64_t> scalars(std::string_view prefix) const {
    LinuxPlatform linuxPlatform(root);
    std::vector<std::int64_t> values;
    linuxPlatform.platform().statistics->initWithDefaultPath()->scalarsForKeyPrefix(
        prefix, yesterday - 1, yesterday + 1,
        [&](auto, auto, auto value, auto&) { values.push_back(value); });
    return values;
  }

  plist::Value preference(std::string_view domain, std::string_view key) const {
    LinuxPlatform linuxPlatform(root);
    return linuxPlatform.platform().preferences->ZTXPreferencesGetValue(key, domain);
  }

  std::string logOf(const char* argument) const {
    return logBelow(root.path("/"), argument, root.path("/errors"));
  }
  void execute(const char* argument) const { executeBelow(root.path("/"), argument); }
};

TEST(DaemonTest, RunsOnceADayAndByForce) {
  const Device device;
  const std::string day = std::to_string(device.yesterday);
  const std::string first = device.logOf("-d");
  EXPECT_TRUE(first.starts_with("default tavrel started\ndefault daily tasks for day " + day +
                                "\ninfo writing tallied log. yesterday=" + day + "\n"))
      << first;
  EXPECT_TRUE(first.ends_with("default tavrel ended\n")) << first;
  EXPECT_EQ(device.logOf("-d"),
            "default tavrel started\ndefault Day unchanged since last run\ndefault tavrel ended\n");
  EXPECT_EQ(device.logOf("-x"),
            "default tavrel started\ndefault Unknown arg: -x\ndefault tavrel ended\n");
  EXPECT_EQ(device.pendingLogs().size(), 1U);
  device.logOf("-f");
  EXPECT_EQ(device.pendingLogs().size(), 2U);
  EXPECT_EQ(device.preference("com.example", "k"), plist::Value(7));
}

TEST(DaemonTest, RemembersWhetherARunFinished) {
  const Device device;
  FileSystem files;
  const auto record = [&] {
    auto run = LastRun::read(device.root, files);
    EXPECT_TRUE(run);
    return *std::move(run);
  };
  int killed = 0;
  std::size_t calls = 200;
  for (; runUntilSystemCall(calls, [&] { device.execute("-d"); }); calls += 100) {
    const auto run = record();
    if (!run || run->isFinished) continue;
    ++killed;
    EXPECT_EQ(run->day, device.yesterday);
    EXPECT_EQ(run->kind, RunKind::Daily);
    EXPECT_FALSE(run->process.isRunning());
  }
  EXPECT_GE(killed, 2);
  device.logOf("-f");
  const auto done = record();
  ASSERT_TRUE(done);
  EXPECT_TRUE(done->isFinished);
  EXPECT_EQ(done->kind, RunKind::Forced);
  EXPECT_EQ(done->lastFinished, done->ended);

  // A run with nothing to do leaves the record alone; one that cannot write it continues.
  const std::string before = contentOf(device.root.path(kLastRunFile));
  device.logOf("-d");
  EXPECT_EQ(contentOf(device.root.path(kLastRunFile)), before);
  std::filesystem::remove(device.root.path(kLastRunFile));
  std::filesystem::create_directories(device.root.path(kLastRunFile) + "/x");
  const std::string log = device.logOf("-t");
  EXPECT_NE(log.find("error this run will not be remembered: "), log.npos) << log;
  EXPECT_NE(log.find("default tavrel ended\n"), log.npos) << log;
}

TEST(DaemonTest, KeepsTheFirstErrorsOfARun) {
  const TemporaryRoot folder;
  FileSystem files;
  LastRun run;
  run.day = 20000;
  run.process = ProcessIdentity::ofThis();
  for (int i = 0; i < 12; ++i)
    run.addError(std::string(299, 'x') + "ü\x01");
  ASSERT_TRUE(run.write(folder.root, files));
  const auto read = LastRun::read(folder.root, files);
  ASSERT_TRUE(read && *read);
  EXPECT_EQ((*read)->errorCount, 12);
  EXPECT_EQ((*read)->errors, Lines(10, std::string(299, 'x') + "…"));
  EXPECT_TRUE((*read)->process.isRunning());
  EXPECT_FALSE((ProcessIdentity{::getpid(), run.process.started, "earlier"}.isRunning()));
  EXPECT_FALSE(
      (ProcessIdentity{::getpid(), run.process.started + 1, run.process.boot}.isRunning()));
  folder.write(kLastRunFile, "garbage");
  EXPECT_EQ(LastRun::read(folder.root, files).error().message,
            "cannot use " + folder.root.path(kLastRunFile) +
                ": it is not the record of a run: remove it");
}

TEST(DaemonTest, RefusesADeviceThatIsNotThere) {
  const TemporaryRoot folder;
  const std::string none = folder.root.path("/none");
  EXPECT_EQ(logBelow(none, "-d", folder.root.path("/errors")),
            "error cannot use device root " + none +
                "/: No such file or directory: name the device's folder with TAVREL_ROOT\n");
  EXPECT_FALSE(std::filesystem::exists(none));
}

TEST(HealthProgramTest, SaysWhatItCannotRead) {
  const TemporaryRoot device;
  const std::string errors = device.root.path("/errors");
  const auto run = [&](const std::string& root, int status, const char* argument = nullptr) {
    const auto program = [&] { executeBelow(root, argument, TAVREL_HEALTH_BINARY); };
    EXPECT_EQ(waitFor(forkProcess(program, errors)), status);
    return loggedIn(errors);
  };
  const std::string none = device.root.path("/none");
  EXPECT_EQ(run(none, 0, "--version"), "");
  EXPECT_EQ(run(none, 2, "nvme0"), "unexpected argument 'nvme0': see --help\n");
  EXPECT_EQ(run(none, 1), "error cannot use device root " + none +
                              "/: No such file or directory: name the device's folder with "
                              "TAVREL_ROOT\n");
  EXPECT_EQ(run(device.root.path("/"), 0), "");
  const std::string memory = device.root.path("/var/lib/tavrel/health/memory.plist");
  std::filesystem::create_directories(memory);
  EXPECT_EQ(run(device.root.path("/"), 0), "error cannot use remembered counters " + memory +
                                               ", starting again: cannot use " + memory +
                                               ": it is a folder; move it away\n");
  std::filesystem::remove(memory);
  device.write("/run/tavrel/health", "");
  const std::string readings = device.root.path("/run/tavrel/health");
  EXPECT_EQ(run(device.root.path("/"), 1), "error cannot list " + readings + ": Not a directory\n");
}

TEST(DaemonTest, RunsWithoutSomebodyToListenToIt) {
  for (const bool areClosed : {true, false}) {
    const Device device;
    const int daemon = forkProcess([&] {
      int gone[2];  // a pipe whose reader has gone
      if (::pipe(gone) != 0 || ::close(gone[0]) != 0) ::_exit(126);
      for (const int stream : {0, 1, 2})
        areClosed ? ::close(stream) : ::dup2(gone[1], stream);
      ::close(gone[1]);
      device.execute("-d");
    });
    EXPECT_EQ(waitFor(daemon), 0);
    EXPECT_EQ(device.preference(kTavrelDomain, kLastRunDayKey), plist::Value(device.yesterday));
    EXPECT_EQ(device.pendingLogs().size(), 1U);
    EXPECT_EQ(device.eccEvents(), kEccEvents);
  }
}

TEST(DaemonTest, ServesAClientWithTheSocketOfTheServiceManager) {
  const Device device;
  const auto listener = ServiceSocket::open(device.root, kTavrelDomain);
  ASSERT_TRUE(listener);
  const int daemon = forkProcess([&] {
    ::dup2(listener->get(), 3);
    ::setenv("LISTEN_FDS", "1", 1);
    ::setenv("LISTEN_PID", std::to_string(::getpid()).c_str(), 1);
    device.execute(nullptr);
  });

  KeptLog log;
  const FileNotifications notifications(device.root, log);
  auto client = ServiceClient::connect(device.root, kTavrelDomain);
  ASSERT_TRUE(client) << client.error().message;
  ASSERT_TRUE(client->send({{"operation", 0}}));
  const auto asked = notifications.waitBeyond(kLoggingNotification, 0, std::chrono::seconds(60));
  ASSERT_TRUE(asked && **asked == 1U);
  const std::string uuid = "00112233-4455-6677-8899-AABBCCDDEEFF";
  const Dictionary app{{"bundle_id", "com.example.walk"}, {"version", "1.2"}, {"uuid", uuid}};
  ASSERT_TRUE(client->send({{"operation", 2}, {"app_data", Array{app}}}));

  EXPECT_EQ(waitFor(daemon), 0);  // after its ten idle seconds
  const auto logs = device.pendingLogs();
  ASSERT_EQ(logs.size(), 1U);
  EXPECT_EQ(logs[0].array("BHActivatedAppInfo").at(0).dictionary().string("bundle"),
            "com.example.walk");
}

TEST(DaemonTest, PausesOnlyForItsOwnSocketWhenItCannotWork) {
  for (const bool isOwn : {true, false}) {
    const int daemon = forkProcess([&] {
      ::setenv("LISTEN_FDS", "1", 1);
      ::setenv("LISTEN_PID", std::to_string(isOwn ? ::getpid() : ::getppid()).c_str(), 1);
      ::alarm(isOwn ? 1 : 20);  // less than the pause; remains across exec
      executeBelow("/nonexistent", nullptr);
    });
    EXPECT_EQ(waitFor(daemon), isOwn ? -SIGALRM : 0);
  }
}

TEST(DaemonTest, LosesNothingWhenManyRunAtOnce) {
  const Device device;
  std::vector<int> processes;
  constexpr int kKeys = 50;
  for (int i = 0; i < 8; ++i) {
    processes.push_back(forkProcess([&] { runDaemon(device.root, "-f"); }));
    processes.push_back(forkProcess([&] {
      LinuxPlatform linuxPlatform(device.root);
      auto batch = linuxPlatform.store().beginBatch();
      if (!batch || !(*batch)->addScalar(device.yesterday, "sum", 1) || !(*batch)->commit()) {
        ::_exit(1);
      }
      const auto preferences = linuxPlatform.platform().preferences;
      for (int key = 0; key < kKeys; ++key) {
        preferences->ZTXPreferencesSetValue(std::to_string(i * kKeys + key), 1, "com.shared");
        if (!preferences->ZTXPreferencesSynchronize("com.shared")) ::_exit(2);
      }
    }));
  }
  for (const int process : processes)
    EXPECT_EQ(waitFor(process), 0);
  EXPECT_EQ(device.pendingLogs().size(), 8U);
  EXPECT_EQ(device.scalars("sum"), std::vector<std::int64_t>{8});
  for (int key = 0; key < 8 * kKeys; ++key)
    EXPECT_TRUE(device.preference("com.shared", std::to_string(key))) << key;
}

// Kills a run before one of its system calls, at moments spread over the whole run. The next run
// must find and leave everything intact. Both may have filed a log.
TEST(DaemonTest, RecoversWhereverARunIsKilled) {
  std::size_t kills = 0;
  for (std::size_t calls = 0;; calls += 7) {
    const Device device;
    if (!runUntilSystemCall(calls, [&] { runDaemon(device.root, "-d"); })) break;
    ++kills;
    const std::size_t logsBefore = device.pendingLogs().size();
    ASSERT_EQ(waitFor(forkProcess([&] { runDaemon(device.root, "-d"); })), 0);
    SCOPED_TRACE(format("killed before system call %zu", calls));
    EXPECT_EQ(device.preference(kTavrelDomain, kLastRunDayKey), plist::Value(device.yesterday));
    EXPECT_EQ(device.preference(kTavrelDomain, kTaskingIDKey), plist::Value("t"));
    EXPECT_EQ(device.preference("com.example", "k"), plist::Value(7));
    EXPECT_EQ(device.scalars("com.norvane.").size(), 335U);
    const int repeated = device.eccEvents() - kEccEvents;
    EXPECT_TRUE(repeated == 0 || repeated == 1) << repeated;  // filed, but still in the queue
    const std::size_t logs = device.pendingLogs().size();
    EXPECT_TRUE(logs == 1 || logs == logsBefore + 1) << logs;
  }
  EXPECT_GT(kills, 20U);
}

}  // namespace
}  // namespace tavrel
