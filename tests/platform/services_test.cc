#include <limits>
#include <regex>
#include <sys/socket.h>
#include <sys/statvfs.h>
#include <sys/un.h>
#include <sys/utsname.h>

#include "base/program.h"
#include "platform/guarded.h"
#include "platform/linux/device/file_device_answers.h"
#include "platform/linux/device/linux_system_version.h"
#include "platform/linux/files/digests.h"
#include "platform/linux/files/stamp.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/logs/file_crash_reporting.h"
#include "platform/linux/logs/json_line.h"
#include "platform/linux/system_log/linux_standard_streams.h"
#include "platform/linux/system_log/linux_system_log.h"
#include "tests/devices/device_services.h"

namespace tavrel {
namespace {

struct Services : DeviceServices {
  LinuxSystemVersion version{root, files, coding, log};
  FileDeviceAnswers answers{root, files, coding, log};
  EccEvents eccEvents{root, files, coding, log, EccEvents::Mode::Consume};
  FileCrashReporting reporting{root, files, version, eccEvents, clock, log};
};

struct ServicesTest : testing::Test, Services {};

TEST_F(ServicesTest, ProgramsThatRunOutOfMemoryOrLoseTheirOutputSaySo) {
  const auto runsOut = []() -> int { throw std::bad_alloc(); };
  EXPECT_EXIT(std::exit(exitStatusOf("name", runsOut)), testing::ExitedWithCode(1),
              "^name: out of memory\n$");
  const auto losesOutput = [] {
    return std::freopen("/dev/full", "w", stdout) != nullptr && std::puts("x") >= 0 ? 0 : 9;
  };
  EXPECT_EXIT(std::exit(exitStatusOf("name", losesOutput)), testing::ExitedWithCode(1),
              "^name: cannot write standard output: free space or check the pipe\n$");
  EXPECT_EQ(loggedStatusOf(log, "work", runsOut), 1);
  EXPECT_EQ(log.lines, (Lines{"work ended early: std::bad_alloc"}));
}

TEST_F(ServicesTest, DeviceAnswersComeFromTheFileAndTheFileSystem) {
  struct statvfs status {};
  ASSERT_EQ(statvfs(root.path("/").c_str(), &status), 0);
  const auto capacity = static_cast<std::int64_t>(status.f_blocks * status.f_frsize);
  const auto usage = answers.SQCopyAnswer("DiskUsage").dictionary();
  EXPECT_EQ(usage.number("TotalDiskCapacity"), capacity);
  EXPECT_GT(usage.number("TotalDataAvailable")->int64(), 0);
  EXPECT_TRUE(answers.SQCopyAnswer("InternalBuild").isNull());

  write("/etc/tavrel/device-answers.plist",
        "<plist version=\"1.0\"><dict><key>InternalBuild</key><true/>"
        "<key>DiskUsage</key><dict/></dict></plist>");
  FileDeviceAnswers recorded(root, files, coding, log);
  EXPECT_TRUE(recorded.SQGetBoolAnswer("InternalBuild"));
  EXPECT_EQ(textOf(recorded.SQCopyAnswer("DiskUsage")), "{}");
  EXPECT_TRUE(log.lines.empty());
}

TEST_F(ServicesTest, SystemVersionIsReadOrMadeFromOsRelease) {
  utsname kernel{};
  ASSERT_EQ(uname(&kernel), 0);
  const std::string release = kernel.release;
  const std::tuple<const char*, const char*, std::string> kCases[] = {
      {"NAME=\"Debian GNU/Linux\"\nVERSION_ID=\"12\"\n", nullptr,
       "Debian GNU/Linux 12 (12-" + release + ")"},
      {"# NAME=no\n NAME='A \"b\" \\c'\r\nVERSION_ID=1\nNAMES=no\nBUILD_ID=20.1", nullptr,
       "A \"b\" \\c 1 (20.1)"},
      {"", nullptr, "(" + release + ")"},
      {"VERSION_ID=1\n", "<plist", "unknown"},
      {"VERSION_ID=1\n",
       "<plist version=\"1.0\"><dict><key>ProductName</key><string>Pellio</string>"
       "<key>ProductVersion</key><integer>4</integer>"
       "<key>ProductBuildVersion</key><string>16R349</string></dict></plist>",
       "Pellio (16R349)"}};
  for (const auto& [osRelease, list, text] : kCases) {
    Services device;
    device.write("/usr/lib/os-release", osRelease);
    if (list) device.write("/etc/tavrel/system-version.plist", list);
    EXPECT_EQ(device.version.text(), text);
  }
  // Neither the other file nor the kernel's release stands in for a file that cannot be read.
  Services device;
  device.write("/usr/lib/os-release", "VERSION_ID=1\n");
  std::filesystem::create_directories(device.root.path("/etc/os-release"));
  EXPECT_EQ(device.version.text(), "unknown");
  EXPECT_EQ(device.log.lines.size(), 1U);
}

TEST_F(ServicesTest, CrashReportingKeepsRecordsPerTypeOfThirtyOneDays) {
  const std::string folder = "/var/mobile/Library/Logs/CrashReporter/StructuredData/";
  const std::byte bytes[] = {std::byte{0xAB}, std::byte{0x01}};
  reporting.FLLogStructuredData(
      172, {{"id", std::numeric_limits<std::int64_t>::min()},
            {"big", std::numeric_limits<std::uint64_t>::max()},
            {"real", 0.1},
            {"list", plist::Array{true, plist::Data(bytes), plist::Array::create()}},
            {"te\"xt", "a\nb"}});
  EXPECT_EQ(contentOf(root.path(folder + "172-2026-11-27.jsonl")),
            R"({"time":"2026-11-27T18:02:18.250Z","type":172,"record":{"id":-9223372036854775808,)"
            R"("big":18446744073709551615,"real":0.1,"list":[true,"ab01",[]],)"
            R"("te\"xt":"a\nb"}})"
            "\n");

  // One of 32 days is removed: one in the future, otherwise the oldest.
  Lines kept{"172-2026-11-27.jsonl", "172-2026-11-28.jsonl", "notes.txt", "x172-1999-01-01.jsonl"};
  for (int day = 1; day <= 29; ++day)
    kept.push_back(format("176-2026-01-%02d.jsonl", day));
  std::sort(kept.begin(), kept.end());
  for (const std::string& name : kept)
    if (!name.ends_with("11-27.jsonl")) write(folder + name, "x\n");
  for (const char* gone : {"172-2026-11-29.jsonl", "172-1999-01-01.jsonl"}) {
    write(folder + gone, "x\n");
    reporting.FLDumpAllOldStructuredDataLogs();
    EXPECT_EQ(*files.list(root.path(folder)), kept) << gone;
  }
  EXPECT_TRUE(log.lines.empty());
}

TEST_F(ServicesTest, CrashReportingRollsTheSupportLog) {
  const std::string support = "/var/mobile/Library/Logs/NorvaneCare/support.log";
  const auto held = [&] {
    std::string all;
    for (const char* number : {"", ".1", ".2", ".3", ".4", ".5", ".6"})
      all += files.readIfPresent(root.path(support + number), 10)->value_or("-");
    return all;
  };
  reporting.rollNorvaneCareLogs();
  for (const char* text : {"a", "b", "c", "", "d", "e", "f"}) {
    write(support, text);
    reporting.rollNorvaneCareLogs();
  }
  EXPECT_EQ(held(), "-fedcb-");
  std::filesystem::remove(root.path(support + ".2"));  // the state after an interrupted roll-over
  write(support, "g");
  reporting.rollNorvaneCareLogs();
  EXPECT_EQ(held(), "-gfdcb-");
  EXPECT_TRUE(log.lines.empty());
}

TEST_F(ServicesTest, CrashReportingNamesTheDevice) {
  write("/etc/machine-id", "0123456789abcdef0123456789abcdef\n");
  write("/sys/firmware/devicetree/base/model", std::string("Pellio \tBoard 2\0", 16));
  const std::regex uuid("[0-9A-F]{8}-[0-9A-F]{4}-4[0-9A-F]{3}-[89AB][0-9A-F]{3}-[0-9A-F]{12}");
  EXPECT_EQ(reporting.systemIdentifier(), "E92D9BA2-1CAA-529C-3CD6-BDF6524057A6");
  EXPECT_EQ(reporting.hardwareModel(), "Pellio  Board 2");
  const std::string incident = reporting.incidentIdentifier();
  EXPECT_TRUE(std::regex_match(incident, uuid)) << incident;
  EXPECT_NE(incident, reporting.incidentIdentifier());
  write("/etc/machine-id", "uninitialized\n");
  EXPECT_EQ(reporting.systemIdentifier(), "unknown");
}

TEST_F(ServicesTest, SystemLogWritesLinesOnAStreamAndCutsLongMessagesAboveDebugLevel) {
  const std::string path = root.path("/stream");
  const Descriptor stream(open(path.c_str(), O_RDWR | O_CREAT, 0600));
  unsetenv("JOURNAL_STREAM");
  LinuxSystemLog systemLog(stream.get());
  constexpr std::size_t kLongest = LinuxSystemLog::kLongestMessage;
  const std::string longest(kLongest - 1, 'a'), whole = longest + "\xC3\xA9z";
  const std::string bytes(kLongest + 9, '\x80'), more = "@debug " + whole + "\n";
  std::string escapes, expected;
  while (escapes.size() < 4 * bytes.size())
    escapes += "\\x80";
  const std::tuple<LogLevel, std::string, std::string> cases[] = {
      {LogLevel::Error, "one\ntwo\n", "@error one\n  two\n  \n"},
      {LogLevel::Info, "k\x1B[2J\t\x7F\xC2\x9B\x9B\xC3\xA9\xEF\xBF\xBD\xE2\x82",
       "@info k\\x1B[2J\\x09\\x7F\\xC2\\x9B\\x9B\xC3\xA9\xEF\xBF\xBD\\xE2\\x82\n"},
      {LogLevel::Info, longest, "@info " + longest + "\n"},
      {LogLevel::Default, whole, "@default " + longest + "… and 3 bytes more\n" + more},
      {LogLevel::Debug, whole, more},
      {LogLevel::Error, bytes,
       "@error " + escapes.substr(0, 4 * kLongest) + "… and 9 bytes more\n@debug " + escapes +
           "\n"}};
  for (const auto& [level, message, lines] : cases) {
    systemLog.write(level, message);
    expected += lines;
  }
  const std::regex time(R"(\d{4}-\d\d-\d\dT\d\d:\d\d:\d\d\.\d{3}Z )");
  EXPECT_EQ(std::regex_replace(contentOf(path), time, "@"), expected);
}

TEST_F(ServicesTest, SystemLogSpeaksToTheJournalWhenTheStreamIsItsOwn) {
  const std::string path = root.path("/socket");
  const Descriptor journal(socket(AF_UNIX, SOCK_DGRAM, 0));
  sockaddr_un address{.sun_family = AF_UNIX, .sun_path = {}};
  path.copy(address.sun_path, sizeof(address.sun_path) - 1);
  ASSERT_EQ(bind(journal.get(), reinterpret_cast<sockaddr*>(&address), sizeof(address)), 0);
  const Descriptor stream(open(root.path("/stream").c_str(), O_RDWR | O_CREAT, 0600));
  struct stat status {};
  ASSERT_EQ(fstat(stream.get(), &status), 0);
  const std::string name = std::to_string(status.st_dev) + ":" + std::to_string(status.st_ino);
  const auto received = [&](int flags = 0) {
    std::string packet(1000, '\0');
    const ssize_t size = recv(journal.get(), packet.data(), packet.size(), flags);
    return size < 0 ? "nothing" : packet.substr(0, static_cast<std::size_t>(size));
  };
  setenv("JOURNAL_STREAM", name.c_str(), 1);
  LinuxSystemLog systemLog(stream.get(), path);
  LinuxSystemLog without(stream.get(), path + ".none");
  systemLog.write(LogLevel::Info, "one\n\033two");
  without.write(LogLevel::Error, "one\ntwo");
  unsetenv("JOURNAL_STREAM");
  const std::string packet = received();
  EXPECT_EQ(packet.substr(0, 29), "PRIORITY=6\nSYSLOG_IDENTIFIER=");
  EXPECT_TRUE(packet.ends_with(std::string("\nMESSAGE\n\13\0\0\0\0\0\0\0one\n\\x1Btwo\n", 29)))
      << packet;

  // An entry too large for a datagram arrives as a file, without bytes of its own.
  systemLog.write(LogLevel::Debug, std::string(16U << 20, 'x'));
  EXPECT_EQ(received(MSG_DONTWAIT), "");
  EXPECT_EQ(*FileSystem().read(root.path("/stream"), 100), "<3>one\n<3>two\n");

  // Standard error of the system becomes entries at debug level, without line ends.
  LinuxStandardStreams streams(systemLog);
  for (const char* text : {"no end", "an end\n"}) {
    streams.writeError(text);
    const std::string entry = received(MSG_DONTWAIT);
    EXPECT_TRUE(entry.starts_with("PRIORITY=7\n")) << entry;
    EXPECT_TRUE(
        entry.ends_with(std::string("MESSAGE\n\6\0\0\0\0\0\0\0", 16) + std::string(text, 6) + "\n"))
        << entry;
  }
}

TEST_F(ServicesTest, DigestsAndStampsAreExact) {
  std::string digest;
  appendHex(digest, LinuxDigest().md5(asBytes("abc")));
  appendHex(digest, sha256(asBytes("abc")));
  EXPECT_EQ(digest,
            "900150983cd24fb0d6963f7d28e17f72"
            "ba7816bf8f01cfea414140de5dae2223b00361a396177a9cb410ff61f20015ad");
  EXPECT_EQ(compactStamp(plist::Date::since1970(-0.5)), "19691231T235959Z");
  EXPECT_EQ(preciseStamp(plist::Date::since1970(-0.5)), "1969-12-31T23:59:59.500Z");
}

TEST_F(ServicesTest, PlatformWritesNothingUnlessAsked) {
  EXPECT_FALSE(LinuxPlatform(root).platform().submission->isDiagnosticSubmissionEnabled());
  EXPECT_TRUE(std::filesystem::is_empty(root.path("/")));
}

}  // namespace
}  // namespace tavrel
