#include <fcntl.h>
#include <limits>
#include <regex>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <sys/un.h>
#include <sys/utsname.h>

#include "base/text.h"
#include "fixed_clock.h"
#include "platform/linux/device/file_device_answers.h"
#include "platform/linux/device/linux_system_version.h"
#include "platform/linux/files/digests.h"
#include "platform/linux/files/stamp.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/logs/file_crash_reporting.h"
#include "platform/linux/logs/json_line.h"
#include "platform/linux/system_log/linux_standard_streams.h"
#include "platform/linux/system_log/linux_system_log.h"
#include "platform/plist/coding.h"
#include "temporary_root.h"

namespace tavrel {
namespace {

namespace fs = std::filesystem;

struct Services : TemporaryRoot {
  KeptLog log;
  FileSystem files;
  FixedClock clock;
  plist::PlistCoding propertyLists;
  LinuxSystemVersion version{root, files, propertyLists, log};
  FileDeviceAnswers answers{root, files, propertyLists, log};
  EccEvents eccEvents{root, files, propertyLists, log, EccEvents::Mode::Consume};

  std::string read(std::string_view path) const {
    return *FileSystem().read(root.path(path), 1U << 20);
  }
};

TEST(DeviceAnswers, ComeFromTheFileAndTheFileSystem) {
  Services device;
  struct statvfs status {};
  ASSERT_EQ(statvfs(device.root.path("/").c_str(), &status), 0);
  const auto capacity = static_cast<std::int64_t>(status.f_blocks * status.f_frsize);
  const auto usage = device.answers.SQCopyAnswer("DiskUsage").dictionary();
  EXPECT_EQ(usage.number("TotalDiskCapacity"), capacity);
  EXPECT_GT(usage.number("TotalDataAvailable")->int64(), 0);
  EXPECT_TRUE(device.answers.SQCopyAnswer("InternalBuild").isNull());

  device.write("/etc/tavrel/device-answers.plist",
               "<plist version=\"1.0\"><dict><key>InternalBuild</key><true/>"
               "<key>DiskUsage</key><dict/></dict></plist>");
  FileDeviceAnswers recorded(device.root, device.files, device.propertyLists, device.log);
  EXPECT_TRUE(recorded.SQGetBoolAnswer("InternalBuild"));
  EXPECT_EQ(textOf(recorded.SQCopyAnswer("DiskUsage")), "{}");
  EXPECT_TRUE(device.log.lines.empty());
}

TEST(SystemVersion, IsReadOrMadeFromOsRelease) {
  utsname kernel{};
  ASSERT_EQ(uname(&kernel), 0);
  const std::string release = kernel.release;
  const std::pair<std::string, std::string> kCases[] = {
      {"NAME=\"Debian GNU/Linux\"\nVERSION_ID=\"12\"\n",
       "Debian GNU/Linux 12 (12-" + release + ")"},
      {"# NAME=no\n NAME='A \"b\" \\c'\r\nVERSION_ID=1\nNAMES=no\nBUILD_ID=20.1",
       "A \"b\" \\c 1 (20.1)"},
      {"", "(" + release + ")"}};
  for (const auto& [osRelease, text] : kCases) {
    Services device;
    device.write("/usr/lib/os-release", osRelease);
    EXPECT_EQ(device.version.text(), text);
  }
  Services device;
  device.write("/etc/tavrel/system-version.plist",
               "<plist version=\"1.0\"><dict><key>ProductName</key><string>Pellio</string>"
               "<key>ProductVersion</key><integer>4</integer>"
               "<key>ProductBuildVersion</key><string>16R349</string></dict></plist>");
  EXPECT_EQ(device.version.text(), "Pellio (16R349)");
  Services damaged;
  damaged.write("/usr/lib/os-release", "VERSION_ID=1\n");
  damaged.write("/etc/tavrel/system-version.plist", "<plist");
  EXPECT_EQ(damaged.version.text(), "unknown");
}

TEST(CrashReporting, KeepsRecordsPerTypeAndDayForThirtyDays) {
  Services device;
  FileCrashReporting reporting(device.root, device.files, device.version, device.eccEvents,
                               device.clock, device.log);
  const std::string folder = "/var/mobile/Library/Logs/CrashReporter/StructuredData/";
  const std::byte bytes[] = {std::byte{0xAB}, std::byte{0x01}};
  reporting.FLLogStructuredData(
      172, {{"id", std::numeric_limits<std::int64_t>::min()},
            {"big", std::numeric_limits<std::uint64_t>::max()},
            {"real", 0.1},
            {"list", plist::Array{true, plist::Data(bytes), plist::Array::create()}},
            {"te\"xt", "a\nb"}});
  EXPECT_EQ(device.read(folder + "172-2026-11-27.jsonl"),
            R"({"time":"2026-11-27T18:02:18.250Z","type":172,"record":{"id":-9223372036854775808,)"
            R"("big":18446744073709551615,"real":0.1,"list":[true,"ab01",[]],)"
            R"("te\"xt":"a\nb"}})"
            "\n");

  for (const char* name : {"172-2026-10-27.jsonl", "176-1999-01-01.jsonl", "172-2026-10-28.jsonl",
                           "172-2030-01-01.jsonl", "notes.txt", "x172-1999-01-01.jsonl"}) {
    device.write(folder + name, "x\n");
  }
  reporting.FLDumpAllOldStructuredDataLogs();
  EXPECT_EQ(*device.files.list(device.root.path(folder)),
            (Lines{"172-2026-10-28.jsonl", "172-2026-11-27.jsonl", "172-2030-01-01.jsonl",
                   "notes.txt", "x172-1999-01-01.jsonl"}));
  EXPECT_TRUE(device.log.lines.empty());
}

TEST(CrashReporting, RollsTheSupportLog) {
  Services device;
  FileCrashReporting reporting(device.root, device.files, device.version, device.eccEvents,
                               device.clock, device.log);
  const std::string log = "/var/mobile/Library/Logs/NorvaneCare/support.log";
  const auto held = [&] {
    std::string all;
    for (const char* number : {"", ".1", ".2", ".3", ".4", ".5", ".6"}) {
      const auto text = *device.files.readIfPresent(device.root.path(log + number), 10);
      all += text.value_or("-");
    }
    return all;
  };
  reporting.rollNorvaneCareLogs();
  for (const char* text : {"a", "b", "c", "", "d", "e", "f"}) {
    device.write(log, text);
    reporting.rollNorvaneCareLogs();
  }
  EXPECT_EQ(held(), "-fedcb-");
  fs::remove(device.root.path(log + ".2"));  // as a roll that was cut short leaves it
  device.write(log, "g");
  reporting.rollNorvaneCareLogs();
  EXPECT_EQ(held(), "-gfdcb-");
  EXPECT_TRUE(device.log.lines.empty());
}

TEST(CrashReporting, NamesTheDevice) {
  Services device;
  FileCrashReporting reporting(device.root, device.files, device.version, device.eccEvents,
                               device.clock, device.log);
  device.write("/etc/machine-id", "0123456789abcdef0123456789abcdef\n");
  device.write("/sys/firmware/devicetree/base/model", std::string("Pellio \tBoard 2\0", 16));
  const std::regex uuid("[0-9A-F]{8}-[0-9A-F]{4}-4[0-9A-F]{3}-[89AB][0-9A-F]{3}-[0-9A-F]{12}");
  const std::string identifier = reporting.systemIdentifier();
  EXPECT_EQ(reporting.hardwareModel(), "Pellio  Board 2");
  const std::string incident = reporting.incidentIdentifier();
  EXPECT_TRUE(std::regex_match(incident, uuid)) << incident;
  EXPECT_NE(incident, reporting.incidentIdentifier());
  device.write("/etc/machine-id", "uninitialized\n");
  EXPECT_EQ(reporting.systemIdentifier(), "unknown");
  EXPECT_NE(identifier, "unknown");
}

TEST(SystemLog, WritesLinesOnAStream) {
  int ends[2];
  ASSERT_EQ(pipe(ends), 0);
  const Descriptor reading(ends[0]), writing(ends[1]);
  unsetenv("JOURNAL_STREAM");
  LinuxSystemLog log(writing.get());
  log.write(LogLevel::Default, "tavrel started");
  log.write(LogLevel::Error, "one\ntwo\n");
  log.write(LogLevel::Info, "k\x1B[2J\t\x7F\xC2\x9B\x9B\xC3\xA9\xEF\xBF\xBD\xE2\x82");
  std::string text(1000, '\0');
  text.resize(static_cast<std::size_t>(read(reading.get(), text.data(), text.size())));
  const std::string time = R"(\d{4}-\d\d-\d\dT\d\d:\d\d:\d\d\.\d{3}Z)";
  EXPECT_TRUE(std::regex_match(
      text, std::regex(time + " default tavrel started\n" + time + " error one\n  two\n  \n" +
                       time + R"( info k\\x1B\[2J\\x09\\x7F\\xC2\\x9B\\x9B)" +
                       "\xC3\xA9\xEF\xBF\xBD" + R"(\\xE2\\x82)" + "\n")))
      << text;
}

TEST(SystemLog, SpeaksToTheJournalWhenTheStreamIsItsOwn) {
  const TemporaryRoot device;
  const std::string path = device.root.path("/socket");
  const Descriptor journal(socket(AF_UNIX, SOCK_DGRAM, 0));
  sockaddr_un address{.sun_family = AF_UNIX, .sun_path = {}};
  path.copy(address.sun_path, sizeof(address.sun_path) - 1);
  ASSERT_EQ(bind(journal.get(), reinterpret_cast<sockaddr*>(&address), sizeof(address)), 0);
  const Descriptor stream(open(device.root.path("/stream").c_str(), O_RDWR | O_CREAT, 0600));
  struct stat status {};
  ASSERT_EQ(fstat(stream.get(), &status), 0);
  const std::string name = std::to_string(status.st_dev) + ":" + std::to_string(status.st_ino);
  const auto received = [&](int flags = 0) {
    std::string packet(1000, '\0');
    const ssize_t size = recv(journal.get(), packet.data(), packet.size(), flags);
    packet.resize(static_cast<std::size_t>(std::max<ssize_t>(size, 0)));
    return packet;
  };
  setenv("JOURNAL_STREAM", name.c_str(), 1);
  LinuxSystemLog log(stream.get(), path);
  LinuxSystemLog without(stream.get(), path + ".none");
  log.write(LogLevel::Info, "one\ntwo");
  without.write(LogLevel::Error, "one\ntwo");
  unsetenv("JOURNAL_STREAM");
  const std::string packet = received();
  EXPECT_EQ(packet.substr(0, 29), "PRIORITY=6\nSYSLOG_IDENTIFIER=");
  EXPECT_TRUE(packet.ends_with(std::string("\nMESSAGE\n\7\0\0\0\0\0\0\0one\ntwo\n", 25))) << packet;

  // An entry beyond a datagram arrives as a file, without bytes of its own.
  log.write(LogLevel::Debug, std::string(16U << 20, 'x'));
  EXPECT_EQ(received(MSG_DONTWAIT), "");
  EXPECT_EQ(*FileSystem().read(device.root.path("/stream"), 100), "<3>one\n<3>two\n");

  // What the system prints on standard error is an entry at debug level, without its line end.
  LinuxStandardStreams streams(log);
  for (const char* text : {"no end", "an end\n"}) {
    streams.writeError(text);
    const std::string entry = received(MSG_DONTWAIT);
    EXPECT_TRUE(entry.starts_with("PRIORITY=7\n")) << entry;
    EXPECT_TRUE(
        entry.ends_with(std::string("MESSAGE\n\6\0\0\0\0\0\0\0", 16) + std::string(text, 6) + "\n"))
        << entry;
  }
}

TEST(SystemLog, CutsLongMessagesAboveDebugLevel) {
  constexpr std::size_t kLongest = LinuxSystemLog::kLongestMessage;
  const std::string whole = std::string(kLongest - 1, 'a') + "\xC3\xA9" + "z";
  const TemporaryRoot device;
  const std::string path = device.root.path("/stream");
  const Descriptor stream(open(path.c_str(), O_RDWR | O_CREAT, 0600));
  LinuxSystemLog log(stream.get());
  log.write(LogLevel::Info, whole.substr(0, kLongest - 1));
  log.write(LogLevel::Default, whole);
  log.write(LogLevel::Debug, whole);
  log.write(LogLevel::Error, std::string(kLongest + 9, '\x80'));
  Lines lines;
  std::ifstream written(path);
  for (std::string line; std::getline(written, line);)
    lines.push_back(line.substr(line.find(' ') + 1));
  ASSERT_EQ(lines.size(), 6U);
  EXPECT_EQ(lines[0], "info " + whole.substr(0, kLongest - 1));
  EXPECT_EQ(lines[1], "default " + whole.substr(0, kLongest - 1) + "… and 3 bytes more");
  EXPECT_EQ(lines[2], "debug " + whole);
  EXPECT_EQ(lines[3], "debug " + whole);
  EXPECT_TRUE(lines[4].starts_with("error \\x80") && lines[4].ends_with("x80… and 9 bytes more"));
}

TEST(SmallServices, AnswerWhatTheyAreFor) {
  std::string digest;
  appendHex(digest, LinuxDigest().md5(asBytes("abc")));
  appendHex(digest, sha256(asBytes("abc")));
  EXPECT_EQ(digest,
            "900150983cd24fb0d6963f7d28e17f72"
            "ba7816bf8f01cfea414140de5dae2223b00361a396177a9cb410ff61f20015ad");
  EXPECT_EQ(dayOf(plist::Date::since1970(-0.5)), -1);
  EXPECT_EQ(compactStamp(plist::Date::since1970(-0.5)), "19691231T235959Z");
  EXPECT_EQ(preciseStamp(plist::Date::since1970(-0.5)), "1969-12-31T23:59:59.500Z");
}

TEST(Platform, WritesNothingUnlessAskedAndEverythingAtTheEnd) {
  const TemporaryRoot device;
  EXPECT_FALSE(LinuxPlatform(device.root).platform().submission->isDiagnosticSubmissionEnabled());
  EXPECT_TRUE(fs::is_empty(device.root.path("/")));
  {
    LinuxPlatform linux(device.root);
    linux.platform().preferences->ZTXPreferencesSetValue("k", 7, "com.example");
    linux.platform().statistics->BHClientSetValueForScalarKey("com.example.key", 9);
  }
  LinuxPlatform later(device.root);
  Platform& platform = later.platform();
  EXPECT_EQ(platform.preferences->ZTXPreferencesGetIntegerValue("k", "com.example"), 7);
  std::int64_t found = 0;
  platform.statistics->initWithDefaultPath()->scalarsForKeyPrefix(
      "", 0, platform.statistics->BHDaysSince1970(),
      [&](std::string_view, std::int32_t, std::int64_t value, bool&) { found = value; });
  EXPECT_EQ(found, 9);
}

}  // namespace
}  // namespace tavrel
