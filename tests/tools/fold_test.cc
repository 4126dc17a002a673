// What programs record, as the tool shows and folds it.
#include <dlfcn.h>
#include <optional>
#include <pwd.h>
#include <sys/resource.h>
#include <unistd.h>

#include "brimhold/client.h"
#include "device.h"
#include "tools/console/day_argument.h"

extern "C" int getpwnam_r(const char* name, passwd* entry, char* text, size_t size,
                          passwd** found) {
  static const auto real = reinterpret_cast<decltype(&getpwnam_r)>(dlsym(RTLD_NEXT, "getpwnam_r"));
  if (name != std::string("unreachable")) return real(name, entry, text, size, found);
  *found = nullptr;
  return EIO;
}

namespace tavrel {
namespace {

// Another program records, whose values wait to be folded.
void recordElsewhere(const TemporaryDevice& device, std::initializer_list<double> values = {}) {
  std::filesystem::create_directories(device.path("/run/tavrel/stat"));
  EXPECT_EQ(inChild([&] {
              setenv("TAVREL_ROOT", device.path("").c_str(), 1);
              BHClientScalarAdd(BHClientScalarForKey("app.n"), 3);
              for (const double value : values)
                BHClientDistributionRecord(BHClientDistributionForKey("app.t"), value);
              return 0;
            }),
            0);
}

using StatFoldTest = DeviceTest;

TEST_F(StatFoldTest, ShowsWhatWaitsAndFoldsIt) {
  device.check("stat fold", prints("nothing to fold: the device has no folder /run/tavrel/stat\n"));
  device.run("stat import", "scalar\t2\tapp.old\t1\nvalue\t2\tapp.t\t5\t0.5\n");
  const std::filesystem::path folder = device.path("/run/tavrel/stat");
  std::filesystem::create_directories(folder);
  device.check("stat fold", prints("0 segments: 0 scalars, 0 values; 0 removed\n"));
  recordElsewhere(device, {1.5, 2.5});
  ASSERT_FALSE(std::filesystem::is_empty(folder)) << "libbrimhold keeps its first device root";
  {
    Openings opened(std::filesystem::directory_iterator(folder)->path());
    for (const auto& [command, times] : {std::pair("export openmetrics", 3),
                                         {"page -o -", 6},
                                         {"completion days", 0},
                                         {"stat list", 1}}) {
      device.run(command);
      EXPECT_EQ(opened.take(), times) << command;
    }
  }
  expectIn(device.run("page -o -").out, {"Device on " + dayDateText(today()), "app.<wbr>n"});
  std::ofstream(folder / "x.segment") << "no segment";
  device.write(kWhitelistFile, xmlOf(R"({"G": {
      "ScalarKeys": {"app.n": {}}, "DistributionKeys": {"app.t": {"intervals": [2]}}}})"));
  const Lines readings{"stat list app.t --day today", "stat show app.t", "stat show app.n",
                       "stat export", "stat export app.t --day today"};
  std::vector<Outcome> before;
  for (const std::string& reading : readings)
    before.push_back(device.run(reading));
  const auto json = device.json("stat list");
  EXPECT_EQ(json["scalars"][1]["value"], 3);
  EXPECT_EQ(json["distributions"][1]["count"], 2);
  EXPECT_EQ(before[3].out.find("scalar\t2\tapp.old\t1\nscalar\t"), 0U) << before[3];
  EXPECT_EQ(device.run("stat show app.none").status, 1);

  const auto preview = [&] {
    std::string log = device.run("log preview --day today").out;
    return log.erase(std::min(log.find("<date>"), log.size()), sizeof "<date>2026-11-27T11:16:25Z");
  };
  const std::string log = preview();
  expectIn(log, {"<key>app.n</key>", "<key>app.t</key>"});
  device.run("prefs set com.norvane.zentrix DiagnosticSubmissionEnabled true --bool");
  expectIn(device.run("rehearse --today").out,
           {format("reads scalars of day %d: 1 row\n", today())});
  const std::string aside = device.path(kStore + ".corrupt-x");
  device.write(kStore + ".corrupt-x", "");
  const Outcome part = device.run("log preview --day today");
  EXPECT_TRUE(part.status == 1 &&
              part.error.ends_with(": rows may be missing: they were in " + aside +
                                   ", which is damaged: inspect or remove that file\n"))
      << part;
  expectIn(device.run("rehearse --today").out, {" without statistics that could not be read"});
  std::filesystem::remove(aside);

  expectIn(device.run("status --check").out,
           {"OK folding: 2 segments, 2 statistics with values that wait, for "});
  const Outcome folded = device.run("stat fold");
  EXPECT_EQ(folded.out, "1 segment: 1 scalar, 2 values; 1 removed\nrefused: 0 values, 1 file\n");
  EXPECT_EQ(folded.error, "tavrelctl: \"x.segment\" in " + folder.string() +
                              " is refused: not a segment; remove it\n");
  EXPECT_EQ(folded.status, 0);
  for (std::size_t i = 0; i < readings.size(); ++i) {
    if (i != 3) {  // the fold adds statistics of its own
      EXPECT_EQ(device.run(readings[i]), before[i]) << readings[i];
    }
  }
  EXPECT_EQ(preview(), log);
  EXPECT_EQ(device.json("stat fold"),
            R"({"format_version": 1, "segments": 0, "scalars": 0, "values": 0, "removed": 0,
                "waiting": 0, "dropped": 0, "refused": 0, "segments_refused": 0})"_json);
  expectIn(device.run("stat list").out, {"com.norvane.brimhold.segments_refused"});
  std::filesystem::remove_all(device.path("/var"));
  device.write("/var", "");
  const Outcome failed = device.run("stat fold");
  EXPECT_EQ(failed.status, 1);
  EXPECT_EQ(failed.out, "");
  expectIn(failed.error, {"; what programs recorded waits for the next fold\n"});
}

// A closed store is not an empty one, and no line hides or repeats another.
TEST_F(StatFoldTest, PreviewsSayWhatAUserMayNotRead) {
  if (geteuid() != 0) GTEST_SKIP() << "only root can become another user";
  std::filesystem::permissions(device.path(""), std::filesystem::perms{0755});
  device.run("stat import", "scalar\ttoday\tapp.n\t1\n");
  recordElsewhere(device);
  device.write(kWhitelistFile, xmlOf(R"({"G": {"ScalarKeys": {"app.n": {}}}})"));
  device.write("/etc/tavrel/recorders.plist", xmlOf(R"({"nosuchuser": ["app.x"]})"));
  device.run("prefs set com.norvane.zentrix DiagnosticSubmissionEnabled true --bool");
  const std::string store = device.path(kStore);
  std::filesystem::permissions(store, std::filesystem::perms{0600});
  const auto run = [&](const std::string& command) {
    const Outcome outcome = device.runAsAnother(command);
    EXPECT_EQ(outcome.status, 1) << outcome;
    return outcome;
  };
  const auto expectOnce = [](const Outcome& outcome, const std::string& line) {
    const std::size_t first = outcome.error.find(line);
    EXPECT_NE(first, std::string::npos) << line << "\n" << outcome;
    EXPECT_EQ(outcome.error.find(line, first + 1), std::string::npos) << line << "\n" << outcome;
  };
  const std::string others =
      "tavrelctl: what waits in segments of other users (1) is not shown: run it as root\n";
  const std::string closed = "statistics store " + store + ": ";
  for (const char* command : {"log preview --day today", "log preview --day today -v"}) {
    const Outcome previewed = run(command);
    expectOnce(previewed, others);
    expectOnce(previewed, "no log would be filed for day " + dayText(today()) + ": " + closed);
  }
  const Outcome rehearsed = run("rehearse --today");
  expectOnce(rehearsed, others);
  expectOnce(rehearsed, "the run would log 1 error; the first: ");
  expectIn(rehearsed.out, {": not all statistics could be read; see "});
  expectOnce(run("page -o - --day today"), others);

  std::filesystem::permissions(store, std::filesystem::perms{0644});
  const std::string part = run("log preview --day today -v").error;
  EXPECT_TRUE(part.ends_with(others)) << part;

  device.write("/etc/tavrel/recorders.plist", xmlOf(R"({"unreachable": ["app.x"]})"));
  device.write("/run/tavrel/fold.lock", "");
  for (const auto& segment : std::filesystem::directory_iterator(device.path("/run/tavrel/stat")))
    EXPECT_EQ(chown(segment.path().c_str(), 13, 13), 0);
  expectIn(device.run("status --check").out,
           {"WARNING folding: 1 segment, no fold took values for ",
            "; 1 segment with values that cannot be folded now; "});
}

// However few files may be open, everything is shown, or a line says what could not be read.
TEST_F(StatFoldTest, NothingIsLeftOutWhereNoFileCanBeOpened) {
  device.run("stat import", "scalar\t2\tapp.old\t1\n");
  recordElsewhere(device);
  const auto whole = device.run("stat list");
  expectIn(whole.out, {"app.n"});
  // UBSan opens a pipe when it first sees an exception of some type.
  device.write("/other" + kStore, "no database");
  EXPECT_EQ(TemporaryDevice::runAt(device.path("/other"), "stat list").status, 1);
  const std::string tooMany = "Too many open files";
  const std::string advice = "; raise the number of files that a process may open (ulimit -n)";
  const std::string stored = "tavrelctl: statistics store " + device.path(kStore) +
                             ": unable to open database file (" + tooMany + "): ";
  const auto inFolder = [&](const char* failed) {
    return fails(format("cannot %s %s: ", failed, device.path("/run/tavrel/stat")) + tooMany +
                 advice);
  };
  // The child has three files open; reading the store takes three more.
  const std::optional<Outcome> kWithMore[] = {inFolder("open"), {},    {},   {},
                                              inFolder("list"), whole, whole};
  EXPECT_EQ(inChild([&] {
              close_range(3, ~0U, 0);
              rlimit files{};
              getrlimit(RLIMIT_NOFILE, &files);
              files.rlim_cur = 3;
              for (const auto& expected : kWithMore) {
                EXPECT_EQ(setrlimit(RLIMIT_NOFILE, &files), 0);
                Outcome listed = device.run("stat list");
                if (!expected && listed.error.ends_with('\n')) listed.error.resize(stored.size());
                EXPECT_EQ(listed, expected.value_or(Outcome{1, {}, stored})) << files.rlim_cur;
                ++files.rlim_cur;
              }
              return testing::Test::HasFailure() ? 1 : 0;
            }),
            0);
}

}  // namespace
}  // namespace tavrel
