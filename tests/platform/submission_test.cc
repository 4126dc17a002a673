#include "platform/submission.h"

#include <set>

#include "faulty_file_system.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/logs/file_submission.h"
#include "platform/linux/logs/json_line.h"
#include "platform/linux/logs/log_file_name.h"
#include "tests/devices/device_services.h"
#include "tests/fakes/fake_platform.h"

namespace tavrel {
namespace {

using Place = FileSubmission::Place;

const std::string kContent(10'000, 'L');

constexpr std::int32_t kToday = 20784;  // the day of the fixed clock

struct Service : ProcessServices {
  explicit Service(const DeviceRoot& root, FileSystem* otherFiles = nullptr)
      : ProcessServices(root, otherFiles),
        version(root, fileSystem, coding, log),
        submission(root, services()) {
    store.today = kToday;
  }

  FileSubmission::Services services() {
    return {fileSystem, coding, preferences, preferences, days, version, clock, log};
  }
  void readRowsOf(std::int32_t day) {
    const auto history = days.initWithDefaultPath();
    if (day % 2 == 0) {
      history->scalarsForKeyPrefix("", day - 1, day, {});
    } else {
      history->distributionsForKeyPrefix("", day - 1, day, {});
    }
  }
  bool file(std::string_view name = "log-tallied", const plist::Dictionary& options = {}) {
    readRowsOf(kToday - 1);
    return writeLog(name, options);
  }
  bool writeLog(std::string_view name, const plist::Dictionary& options = {},
                std::string_view type = "193") {
    return submission.ZTXWriteLogForSubmission(type, name, options, [](LogFile& file) {
      file.write(asBytes(std::string_view(kContent).substr(0, 6000)));
      file.write(asBytes(std::string_view(kContent).substr(6000)));
    });
  }

  fakes::Journal journal;
  fakes::FakeStore store{journal};
  DayNotingStore days{store};
  LinuxSystemVersion version;
  FileSubmission submission;
};

const std::string kFolder = "/var/mobile/Library/Logs/Submission/";
const std::string kPermission = "/var/mobile/Library/Preferences/com.norvane.zentrix.plist";

void permit(const TemporaryRoot& device, bool isGiven, const plist::Value& firstDay = {}) {
  plist::Dictionary values{{"DiagnosticSubmissionEnabled", isGiven}};
  values.set("DiagnosticSubmissionFirstDay", firstDay);
  device.write(kPermission, *plist::PlistCoding().encodeXml(values));
}

std::ptrdiff_t filesPending(const TemporaryRoot& device) {
  std::error_code missing;
  const fs::path folder = device.root.path("/var/mobile/Library/Logs/Submission/pending");
  return std::distance(fs::directory_iterator(folder, missing), {});
}

struct Submission : testing::Test, TemporaryRoot {};

TEST_F(Submission, FilesALogWithItsMetadataAndSendsItOn) {
  permit(*this, true, kToday - 1);
  write("/etc/os-release", "NAME=\"Example OS\"\nVERSION_ID=4.2\nBUILD_ID=8N5\n");
  const std::string orphan = "/var/mobile/Library/Logs/Submission/pending/old.metadata.plist";
  write(orphan, "left by a process that was killed");
  Service service(root);
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
  ASSERT_TRUE(service.file("fresh"));
  // The disk is full, the metadata of one log is lost, and that of another has its link already.
  struct Failing : FileSystem {
    int openFile(const char* path, int flags, mode_t mode) override {
      return isLost(path) ? fail(EIO) : FileSystem::openFile(path, flags, mode);
    }
    ssize_t writeFile(int, const std::byte*, std::size_t) override { return fail(ENOSPC); }
    int linkFile(const char* path, const char* name) override {
      return isLost(path) ? fail(EIO) : FileSystem::linkFile(path, name);
    }
    static bool isLost(std::string_view path) {
      return path.find("Storage") != path.npos && path.ends_with(".metadata.plist");
    }
    static int fail(int code) {
      errno = code;
      return -1;
    }
  } failing;
  fs::create_directory(root.path(kFolder + "outbox"));
  const std::string left = logs[0].name + ".metadata.plist";
  fs::create_hard_link(root.path(kFolder + "pending/" + left),
                       root.path(kFolder + "outbox/" + left));
  Service sender(root, &failing);
  for (int time = 0; time < 2; ++time)
    sender.submission.submitDiagnosticLogs();
  EXPECT_EQ(filesPending(*this), 0);
  const auto sent = *service.submission.logs(Place::Outbox);
  ASSERT_EQ(sent.size(), 3U);
  EXPECT_FALSE(sent[0].metadata) << sent[0].name;
  EXPECT_EQ(sent[1].metadata, logs[0].metadata);
  EXPECT_EQ(sent[2].metadata.string("LogName"), "fresh");
  EXPECT_EQ(sender.log.lines, std::vector<std::string>());
  EXPECT_TRUE(service.log.lines.empty());
}

TEST_F(Submission, LogsAreWholeWithMetadataAfterEveryFault) {
  const auto prepare = [](const TemporaryRoot& device) { permit(device, true); };
  strikeEachCall(prepare, [](const TemporaryRoot& device, FaultyFileSystem& faulty) {
    Service service(device.root, &faulty);
    const bool filed = service.file();
    if (!filed) {
      ASSERT_FALSE(service.log.lines.empty());
      EXPECT_EQ(service.log.lines.back().find("cannot file log \"log-tallied\": "), 0U);
      EXPECT_TRUE(!faulty.goesOn() || filesPending(device) == 0) << "nothing of it is left";
    }
    service.submission.submitDiagnosticLogs();
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
    EXPECT_TRUE(faulty.hasStruck() || after.submission.logs(Place::Pending)->empty());

    EXPECT_TRUE(after.file());
    after.submission.submitDiagnosticLogs();
    EXPECT_EQ(after.submission.logs(Place::Pending)->size(), 0U);
    EXPECT_EQ(after.submission.logs(Place::Outbox)->size(), names.size() + 1);
  });
}

TEST_F(Submission, NoTaskingChangesThePermission) {
  for (const bool isGiven : {true, false}) {
    permit(*this, isGiven, kToday);
    LinuxPlatform run(root);
    Preferences& guarded = run.platform().preferences;
    for (const char* const key : {"DiagnosticSubmissionEnabled", "DiagnosticSubmissionFirstDay"}) {
      for (const plist::Value& value : {plist::Value(!isGiven), plist::Value(0), plist::Value()})
        guarded.ZTXPreferencesSetValue(key, value, "com.norvane.zentrix");
    }
    const auto of = [&](const char* key) {
      return run.preferences().ZTXPreferencesGetValue(key, "com.norvane.zentrix");
    };
    EXPECT_EQ(of("DiagnosticSubmissionEnabled"), plist::Value(isGiven));
    EXPECT_EQ(of("DiagnosticSubmissionFirstDay"), plist::Value(kToday));
  }
}

TEST_F(Submission, FilesWhatTheOwnerPermits) {
  constexpr std::int32_t kNoRows = -1;
  const struct {
    bool isGiven;
    plist::Value firstDay;
    std::int32_t day;  // the day of the log's rows
    const char* place;
    bool mayReportYesterday;
    const char* type = "193";
  } kCases[] = {
      {false, {}, kNoRows, "withheld", false},
      {false, {}, kToday - 1, "submission is not allowed", false},
      {false, kToday - 9, kToday - 1, "submission is not allowed", false},
      {true, {}, kNoRows, "pending", true},
      {true, {}, kToday - 1, "pending", true},
      {true, kToday - 1, kToday - 1, "pending", true},
      {true, kToday, kToday - 1, "submission is allowed from day 20784 (2026-11-27) on", false},
      {true, kToday, kToday, "pending", false},
      {true, kToday - 1, kToday - 2, "submission is allowed from day 20783 (2026-11-26) on", true},
      {true, kToday, kNoRows, "pending", false},
      {true, kToday, kToday - 1, "pending", false, "165"},
      {false, {}, kToday - 1, "withheld", false, "165"},
      {true, kToday + 1, kNoRows, "withheld", false},
      {true, "soon", kToday - 1, "submission is held back", false},
      {true, 1.5, kToday - 1, "submission is held back", false},
  };
  for (const auto& given : kCases) {
    SCOPED_TRACE(testing::Message() << given.isGiven << given.day << given.place);
    const TemporaryRoot device;
    permit(device, given.isGiven, given.firstDay);
    Service service(device.root);
    EXPECT_EQ(service.submission.isDiagnosticSubmissionEnabled(), given.mayReportYesterday);
    // The earliest day read is decisive.
    for (const int later : {0, 1})
      if (given.day != kNoRows) service.readRowsOf(given.day + later);
    const bool isRefused = std::string_view(given.place).find(' ') != std::string_view::npos;
    ASSERT_EQ(service.writeLog("X", {}, given.type), !isRefused);
    if (isRefused) {
      EXPECT_NE(service.log.lines.back().find(given.place), std::string::npos)
          << service.log.lines.back();
    } else {
      EXPECT_EQ(std::distance(fs::directory_iterator(device.root.path(kFolder + given.place)), {}),
                2);
    }
    EXPECT_FALSE(service.days.takeEarliest());
  }
}

TEST_F(Submission, WithholdsTheNewestLogsForTheOwnerAlone) {
  Service service(root);
  for (int i = 0; i < 10; ++i) {
    // At first the clock is ahead, in the end it is lost.
    service.clock.time = plist::Date::since1970(i == 0  ? 2'114'380'800
                                                : i < 9 ? 1'795'802'538 + i
                                                        : 5);
    ASSERT_TRUE(service.writeLog("S"));
  }
  const auto logs = *service.submission.logs(Place::Withheld);
  ASSERT_EQ(logs.size(), 8U);
  EXPECT_EQ(logs[0].name.substr(0, 18), "S-19700101T000005Z");
  EXPECT_EQ(logs[1].name.substr(0, 18), "S-20261127T180220Z");
  const std::string folder = root.path(kFolder + "withheld");
  EXPECT_EQ(fs::status(folder).permissions(), fs::perms::owner_all);
  for (const auto& entry : fs::directory_iterator(folder))
    EXPECT_EQ(entry.status().permissions(), fs::perms::owner_read | fs::perms::owner_write);
  EXPECT_EQ(std::distance(fs::directory_iterator(folder), {}), 16);
}

TEST_F(Submission, DeletesWhatWaitsOnceThePermissionIsSurelyGone) {
  for (const char* file :
       {"pending/a.log", "pending/a.metadata.plist", "pending/left.metadata.plist",
        "pending/.tavrel-half.tmp", "outbox/a.log", "outbox/b.log", "outbox/b.metadata.plist"}) {
    write(kFolder + file, "x");
  }
  write(kFolder + "pending/folder.log/foreign", "x");
  write(kFolder + "pending/foreign.txt", "x");
  fs::create_symlink(root.path(kFolder + "pending/foreign.txt"),
                     root.path(kFolder + "pending/link.log"));
  const auto files = [&] {
    std::set<std::string> names;
    for (const auto& entry : fs::recursive_directory_iterator(root.path(kFolder)))
      if (!entry.is_directory() && entry.path().filename() != ".lock")
        names.insert(entry.path().filename());
    return names;
  };
  const auto before = files();
  const auto ask = [&] {
    Service service(root);
    EXPECT_FALSE(service.submission.isDiagnosticSubmissionEnabled());
    service.submission.submitDiagnosticLogs();
    return service.log.lines;
  };
  ask();
  permit(*this, true, kToday + 1);
  ask();
  EXPECT_EQ(files(), before);

  // Preferences that change after the first look count as they are under the lock. When they are
  // damaged or lose the switch, they may have held a permission.
  MeddlingFiles meddling;
  meddling.part = "Submission/.lock";
  const std::string first = "<key>DiagnosticSubmissionFirstDay</key><integer>1</integer>";
  const std::string text = "<key>DiagnosticSubmissionEnabled</key><string>yes</string>";
  for (const std::string& content :
       {std::string("damaged"), "<plist version=\"1.0\"><dict>" + first + "</dict></plist>",
        "<plist version=\"1.0\"><dict>" + first + text + "</dict></plist>"}) {
    permit(*this, false);
    meddling.meddle = [&] { write(kPermission, content); };
    EXPECT_FALSE(Service(root, &meddling).submission.isDiagnosticSubmissionEnabled());
    ask();
    EXPECT_EQ(contentOf(root.path(kPermission)), content);
    EXPECT_EQ(files(), before);
  }
  permit(*this, false);
  meddling.meddle = [&] { permit(*this, true); };
  EXPECT_FALSE(Service(root, &meddling).submission.isDiagnosticSubmissionEnabled());
  EXPECT_EQ(files(), before);
  meddling.meddle = [&] { permit(*this, false); };
  write(kFolder + "pending/c.log", "x");
  Service(root, &meddling).submission.submitDiagnosticLogs();
  EXPECT_TRUE(fs::remove(root.path(kFolder + "pending/c.log"))) << "it is no longer permitted";

  permit(*this, false, kToday + 1);
  EXPECT_EQ(ask(),
            (std::vector<std::string>{"submission is not allowed: 3 waiting logs deleted",
                                      "no log is moved to the outbox: submission is not allowed"}));
  EXPECT_EQ(files(), (std::set<std::string>{"foreign", "foreign.txt"}));
  EXPECT_EQ(contentOf(root.path(kPermission)).find("FirstDay"), std::string::npos);
}

TEST_F(Submission, FilesNothingWhenThePermissionGoesMeanwhile) {
  Service service(root);
  // Withdrawn, and given again for later days.
  for (const bool isGiven : {false, true}) {
    permit(*this, true);
    service.readRowsOf(kToday - 1);
    const plist::Value firstDay = isGiven ? plist::Value(kToday + 1) : plist::Value();
    EXPECT_FALSE(service.submission.ZTXWriteLogForSubmission(
        "193", "log-tallied", {}, [&](LogFile&) { permit(*this, isGiven, firstDay); }));
    EXPECT_EQ(service.log.lines.back(),
              "cannot file log \"log-tallied\": submission is no longer allowed");
  }
  EXPECT_EQ(filesPending(*this), 0);
}

}  // namespace
}  // namespace tavrel
