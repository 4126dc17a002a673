// What a fold refuses, limits, or leaves for the next fold.

#include <array>
#include <cerrno>
#include <climits>
#include <dirent.h>
#include <dlfcn.h>
#include <pwd.h>
#include <random>
#include <sys/resource.h>

#include "base/bytes.h"
#include "base/limits.h"
#include "folding.h"
#include "platform/linux/folding/segment_folder.h"

namespace {
int readableEntries = INT_MAX;
int lookUpResult = 0;
}  // namespace

extern "C" dirent* readdir(DIR* folder) {
  static const auto real = reinterpret_cast<dirent* (*)(DIR*)>(dlsym(RTLD_NEXT, "readdir64"));
  if (readableEntries-- > 0) return real(folder);
  errno = EIO;
  return nullptr;
}

// Each entry of a user seems long.
extern "C" int getpwnam_r(const char* name, passwd* entry, char* text, size_t size,
                          passwd** found) {
  static const auto real = reinterpret_cast<decltype(&getpwnam_r)>(dlsym(RTLD_NEXT, "getpwnam_r"));
  *found = nullptr;
  if (lookUpResult != 0) return lookUpResult;
  return size < 100'000 ? ERANGE : real(name, entry, text, size, found);
}

namespace tavrel {
namespace {

TEST_F(FoldTest, UsersRecordTheirKeysAlone) {
  if (geteuid() != 0) GTEST_SKIP() << "needs root";
  std::filesystem::create_directories(root / "etc/tavrel");
  const auto file = root / "etc/tavrel/recorders.plist";
  const std::string recorders = R"(<?xml version="1.0" encoding="UTF-8"?><plist version="1.0"><dict>
<key>12</key><array><string>com.a.</string><string>com.norvane.a.</string><string>com</string></array>
<key>proxy</key><array><string>com.a.b.</string></array><key>nobody-here</key><array><string>y</string></array>
<key>14</key><string>com.</string></dict></plist>)";
  const Lines keys{"com.a.x", "com.a.b.x", "com.norvane.a.x", "com.norvane.b", "com.b", "x", "y"};
  const std::tuple<std::string, unsigned, uid_t, Lines, std::size_t> cases[] = {
      {recorders, 0644, 0, keys, 2},
      {recorders, 0644, 12, {"com.a.x", "com.b", "com.norvane.a.x"}, 3},
      {recorders, 0644, 13, {"com.a.b.x"}, 3},
      {recorders, 0644, 15, {"x"}, 3},
      {recorders, 0664, 15, {"com.a.b.x", "com.a.x", "com.b", "x", "y"}, 2},
      {"<plist", 0644, 15, {"com.a.b.x", "com.a.x", "com.b", "x", "y"}, 2},
  };
  for (const auto& [content, mode, user, allowed, lines] : cases) {
    SCOPED_TRACE(user);
    std::filesystem::remove(file);
    std::ofstream(file) << content;
    chmod(file.c_str(), mode);
    std::filesystem::remove_all(root / "var");
    std::filesystem::remove(root / "run/tavrel/fold.lock");
    run([&, uid = user] {
      ASSERT_EQ(setuid(uid), 0);
      for (const std::string& key : keys) {
        BHClientScalarAdd(BHClientScalarForKey(key.c_str()), 2);
        BHClientDistributionRecord(BHClientDistributionForKey(key.c_str()), 2);
      }
    });
    const std::size_t refused = keys.size() - allowed.size();
    EXPECT_EQ(foldNow().refused, 2 * refused);
    EXPECT_EQ(log.lines.size(), lines) << testing::PrintToString(log.lines);
    look();
    EXPECT_EQ(figure("refused"), 2 * refused);
    Lines taken;
    for (const auto& [key, values] : records)
      taken.push_back(key);
    Lines expected = allowed;
    std::sort(expected.begin(), expected.end());
    EXPECT_EQ(taken, expected);
    EXPECT_EQ(scalars.size(), allowed.size() + (refused > 0 ? 1 : 0));
  }

  // Root may record everything, and nothing of others is refused while their rights are unknown.
  std::filesystem::remove(file);
  std::ofstream(file) << R"(<plist version="1.0"><dict><key>proxy</key><array>
<string>com.a.</string></array></dict></plist>)";
  const auto live = [](uid_t user) {
    return untilItStops(start([=] {
      ASSERT_EQ(setuid(user), 0);
      BHClientScalarAdd(BHClientScalarForKey("com.a.early"), 2);
      raise(SIGSTOP);
    }));
  };
  const pid_t children[] = {live(0), live(13)};
  EXPECT_EQ(foldNow().scalars, 2U);
  openStoreForWriting(store(), std::make_shared<BusyBudget>(1000))
      .execute("UPDATE segments SET position = x'63000000' WHERE owner = 0");  // keeps it waiting
  lookUpResult = ENFILE;
  run([] { add(1); });
  FoldReport unknown = foldNow();
  EXPECT_EQ(unknown.failure.value_or("") + std::to_string(unknown.scalars), "1");
  EXPECT_EQ(unknown.waiting, 1U);
  for (const pid_t child : children)
    waitFor(child, SIGKILL);
  run([] {
    ASSERT_EQ(setuid(13), 0);
    BHClientScalarAdd(BHClientScalarForKey("com.a.late"), 2);
  });
  {
    LinuxPlatform device(DeviceRoot(root), {.log = &log});
    const Recorders unsure =
        Recorders::read(device.root(), device.fileSystem(), device.platform().propertyLists, log);
    const auto shown = RecordedHistory::open(device.root(), device.store(), unsure,
                                             {.key = "", .lastDay = INT32_MAX});
    EXPECT_EQ(shown->missingValues(),
              (Lines{"1 segment with values that wait is not shown: run 'tavrelctl stat fold'",
                     "1 segment with values that wait is not shown: try again when " +
                         file.string() + " can be read and its users looked up"}));
  }
  unknown = foldNow();
  EXPECT_EQ(unknown.failure,
            file.string() +
                " cannot be read now, or names users who cannot be looked up; what users other "
                "than root recorded waits for the next fold");
  EXPECT_EQ(log.lines, Lines{file.string() + ": cannot look up the user \"proxy\": Too many "
                                             "open files in system"});
  // Nor is anything refused while the file cannot be read or its links lead nowhere.
  lookUpResult = 0;
  std::filesystem::rename(root / "etc/tavrel", root / "etc/away");
  const auto expectWaiting = [&](const std::filesystem::path& made, const std::string& line) {
    EXPECT_EQ(foldNow().failure, unknown.failure);
    EXPECT_NE(log.lines.at(0).find(line), std::string::npos) << log.lines.at(0);
    std::filesystem::remove_all(made);
  };
  std::filesystem::create_symlink("nowhere", root / "etc/tavrel");
  expectWaiting(root / "etc/tavrel",
                ": its folder is a link that leads nowhere, or a file; repair");
  for (const std::string target : {"recorders.plist", "nowhere", ""}) {
    std::filesystem::create_directory(root / "etc/tavrel");
    if (target.empty()) {
      std::filesystem::create_directory(file);
    } else {
      std::filesystem::create_symlink(target, file);
    }
    expectWaiting(root / "etc/tavrel",
                  target == "nowhere" ? ": it is a link that leads nowhere; repair" : "cannot ");
  }
  std::filesystem::rename(root / "etc/away", root / "etc/tavrel");
  lookUpResult = ENOENT;
  const FoldReport refusing = foldNow();
  lookUpResult = 0;
  EXPECT_EQ(refusing.failure.value_or("") + std::to_string(refusing.refused), "1");
}

TEST_F(FoldTest, WhatIsNoSegmentIsRefusedOnce) {
  run([] { add(1); });
  const std::string segment = segments().at(0);
  const auto put = [&](const char* name, std::size_t size) {
    std::ofstream(folder / name) << std::string(size, 'x');
  };
  std::filesystem::copy_file(segment, folder / "z.segment");
  put("size.segment", 5);
  put("other", 0);
  put("linked.segment", 0);
  std::filesystem::create_hard_link(folder / "linked.segment", root / "elsewhere");
  std::filesystem::create_symlink("/etc/passwd", folder / "link.segment");
  mkfifo((folder / "pipe.segment").c_str(), 0666);
  std::filesystem::create_directory(folder / "folder.segment");
  std::filesystem::create_directory(folder / "fold-wanted");
  look(true);
  EXPECT_EQ(scalars.at({"count", kToday}), 1) << "viewers leave the copy out";
  Lines lines;
  {
    LinuxPlatform other((DeviceRoot(root)));
    const auto lock = other.store().beginBatch();
    ASSERT_TRUE((*lock)->segmentNames());
    EXPECT_TRUE(foldNow().failure);  // it tells of files that it cannot count
    lines = log.lines;
  }
  FoldReport report = foldNow();
  EXPECT_EQ(report.segmentsRefused, 7U);
  EXPECT_EQ(report.scalars, 1U);
  const std::string place = "\" in " + folder.string() + " is refused: ";
  Lines expected;
  for (const auto& [name, reason] : std::initializer_list<std::pair<const char*, const char*>>{
           {"z.segment", "a copy of another segment"},
           {"size.segment", "not a segment"},
           {"other", "not the name of a segment"},
           {"linked.segment", "a file with several names"},
           {"link.segment", "a symbolic link"},
           {"pipe.segment", "not a regular file"},
           {"folder.segment", "not a regular file"}})
    expected.push_back(std::string("\"") + name + place + reason + "; remove it");
  std::sort(expected.begin(), expected.end());
  EXPECT_NE(lines, Lines());
  lines.insert(lines.end(), log.lines.begin(), log.lines.end());
  std::sort(lines.begin(), lines.end());
  EXPECT_EQ(lines, expected);
  EXPECT_FALSE(std::filesystem::exists(folder / "fold-wanted"));
  std::filesystem::create_directories(folder / "fold-wanted/x");
  EXPECT_EQ(foldNow().segmentsRefused, 1U);
  EXPECT_EQ(log.lines.size(), 1U);
  EXPECT_NE(log.lines.at(0).find("\"fold-wanted-"), std::string::npos) << log.lines.at(0);
  EXPECT_FALSE(std::filesystem::exists(folder / "fold-wanted"));
  report = foldNow();  // the copy is now alone, and folded as if it had been recorded
  EXPECT_EQ(report.segmentsRefused, 0U);
  EXPECT_EQ(log.lines, Lines());
  look();
  EXPECT_EQ(figure("segments_refused"), 8);

  for (int i = 0; i < 200; ++i)
    put(std::to_string(i).c_str(), 0);
  EXPECT_EQ(foldNow().segmentsRefused, 200U);
  EXPECT_EQ(log.lines.size(), 100U - 8 + 1);  // with those of the earlier folds
  EXPECT_EQ(log.lines.back(), "108 more refusals of this fold are not listed");

  // Once others have used up the room for remembering refusals, these count every time.
  std::ofstream told(root / "run/tavrel/fold.lock");
  told << std::string(16, '\0');
  for (std::uint64_t i = 0; i < 8192; ++i)
    told.write(reinterpret_cast<const char*>(&i), sizeof i);
  told.close();
  for (int time = 0; time < 2; ++time) {
    EXPECT_EQ(foldNow().segmentsRefused, 207U);
    EXPECT_EQ(log.lines, Lines());
  }
}

TEST_F(FoldTest, RandomBytesDoNoHarm) {
  std::mt19937 random(3);
  run([] {
    add(3);
    record(4);
  });
  const auto honest = root / "honest";
  std::filesystem::copy_file(segments().at(0), honest);
  for (int i = fromEnvironment("TAVREL_HOSTILE_SEGMENTS", 60); i > 0; --i) {
    const auto path = folder / (std::to_string(i) + ".segment");
    std::filesystem::copy_file(honest, path);
    std::fstream file(path);
    for (int change = 0; change < 40; ++change) {
      constexpr int kParts[] = {24, 128, kBHKeyTable, kBHNames, kBHCells, kBHChunks};
      file.seekp(kParts[random() % 6] + static_cast<int>(random() % 64));
      const std::uint64_t word = random() % 3 == 0 ? random() : random() % 3 - 1;
      file.write(reinterpret_cast<const char*>(&word), 1 << random() % 4);
    }
    file.close();
    if (random() % 8 == 0) std::filesystem::resize_file(path, random() % kBHSegmentBytes);
    if (i % 50 == 0) {
      EXPECT_FALSE(foldNow().failure);
    }
  }
  // The copies may hold any value of "count", but take nothing from what another program records.
  run([] { BHClientScalarAdd(BHClientScalarForKey("honest"), 3); });
  EXPECT_FALSE(foldNow().failure);
  look();
  EXPECT_EQ(scalar("honest"), 3);
}

TEST_F(FoldTest, ARowThatTakesNothingRefusesItsValuesAlone) {
  const auto recordAll = [] {
    for (const char* key : {"damaged", "whole"})
      BHClientDistributionRecord(BHClientDistributionForKey(key), 1);
    add(1);
  };
  run(recordAll);
  EXPECT_EQ(foldNow().refused, 0U);
  connection().execute("UPDATE distributions SET count = 2 WHERE key = CAST('damaged' AS BLOB)");
  run(recordAll);
  const FoldReport report = foldNow();
  EXPECT_FALSE(report.failure) << *report.failure;
  EXPECT_EQ(report.refused, 1U);
  ASSERT_EQ(log.lines.size(), 1U);
  EXPECT_NE(log.lines[0].find("; what was recorded for \"damaged\" on day "), std::string::npos)
      << log.lines[0];
  EXPECT_TRUE(segments().empty());
  connection().execute("DELETE FROM distributions WHERE key = CAST('damaged' AS BLOB)");
  look();
  EXPECT_EQ(scalar("count"), 2);
  EXPECT_EQ(figure("refused"), 1);
  EXPECT_EQ(records["whole"].size(), 2U);
}

TEST_F(FoldTest, PositionsGoWithTheirSegments) {
  const auto held = [&] {
    LinuxPlatform device((DeviceRoot(root)));
    return (*(*device.store().beginBatch())->segmentNames()).size();
  };
  run([] { add(1); });
  run([] { add(1); });
  EXPECT_EQ(foldNow().removed, 2U);
  EXPECT_EQ(held(), 2U);
  const pid_t child = startWriter();
  foldNow();
  EXPECT_EQ(held(), 1U);
  waitFor(child, SIGKILL);

  // A segment that is temporarily unreadable keeps its position.
  const std::string segment = segments().at(0);
  std::filesystem::create_hard_link(segment, root / "copy");
  EXPECT_EQ(foldNow().segmentsRefused, 1U);
  EXPECT_EQ(held(), 1U);
  std::filesystem::remove(root / "copy");
  signal(SIGIO, SIG_IGN);
  {
    const Descriptor leased(open(segment.c_str(), O_RDWR | O_CLOEXEC));
    ASSERT_EQ(fcntl(leased.get(), F_SETLEASE, F_WRLCK), 0);
    EXPECT_EQ(foldNow().segmentsRefused, 1U);
    EXPECT_EQ(held(), 1U);
    const std::uint64_t most = UINT64_MAX;
    EXPECT_EQ(pwrite(leased.get(), &most, sizeof most, kBHHeaderDropped), 8);
  }
  EXPECT_EQ(foldNow().removed, 1U);

  // A segment that was folded to its end is not read again.
  run([] { add(1); });
  const std::string ended = segments().at(0);
  std::filesystem::copy_file(ended, root / "copy");
  EXPECT_EQ(foldNow().removed, 1U);
  std::filesystem::rename(root / "copy", ended);
  {
    const Descriptor writer(open(ended.c_str(), O_RDWR | O_CLOEXEC));
    EXPECT_EQ(foldNow().segmentsRefused, 1U);
  }
  EXPECT_EQ(foldNow().removed, 1U);
  look();
  EXPECT_EQ(scalar("count"), 4);
  EXPECT_EQ(figure("dropped"), 1'000'000'000);
}

TEST_F(FoldTest, SegmentsBeyondTheLimitGetTheirTurn) {
  run([] { add(1); });
  const std::string model = segments().at(0);
  const Descriptor from(open(model.c_str(), O_RDONLY | O_CLOEXEC));
  const SegmentFile file(from.get());
  constexpr std::uint64_t kSegments = 2 * limits::kSegmentsPerUser + 100;
  for (std::uint64_t number = 1; number < kSegments; ++number) {
    const auto path = folder / (std::to_string(number) + ".segment");
    const Descriptor to(open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600));
    ASSERT_EQ(ftruncate(to.get(), kBHSegmentBytes), 0);
    for (const unsigned at : {0U, unsigned{kBHKeyTable}, unsigned{kBHNames}, unsigned{kBHCells}}) {
      std::array<std::byte, 256> bytes;
      file.read(at, bytes);
      if (at == 0) storeLittle64(bytes, kBHHeaderIdentity, number);
      ASSERT_EQ(pwrite(to.get(), bytes.data(), bytes.size(), at), 256);
    }
  }
  for (const std::uint64_t waiting :
       {kSegments - limits::kSegmentsPerUser, std::uint64_t{100}, std::uint64_t{0}}) {
    EXPECT_EQ(foldNow().waiting, waiting);
    if (waiting > 100) {
      EXPECT_EQ(log.lines, Lines{"segments of user " + std::to_string(geteuid()) +
                                 " wait: there are more than a fold takes; record from fewer "
                                 "programs at a time"});
    }
  }
  look();
  EXPECT_EQ(scalar("count"), kSegments);
}

TEST_F(FoldTest, AStoreFarBeyondItsLimitTakesNothingFromUsers) {
  if (geteuid() != 0) GTEST_SKIP() << "needs root";
  std::filesystem::create_directories(root / "etc/tavrel");
  std::ofstream(root / "etc/tavrel/limits.plist")
      << R"(<plist version="1.0"><dict><key>Store</key><dict><key>Bytes</key>)"
         R"(<integer>1048576</integer></dict></dict></plist>)";
  const auto recordAs = [](uid_t user) {
    run([=] {
      ASSERT_EQ(setuid(user), 0);
      add(1);
      for (int i = 0; i < 60'000; ++i)
        record(i);
    });
  };
  for (int i = 0; i < 4; ++i)
    recordAs(12);
  for (int fold = 0; fold < 2; ++fold) {  // two of 0.7 MB each exceed 1.25 MiB
    EXPECT_EQ(foldNow().waiting, 2U);
    EXPECT_EQ(log.lines.size(), fold == 0 ? 1U : 0U);
  }
  recordAs(0);
  EXPECT_EQ(foldNow().values, 60'000U);
  look();
  EXPECT_EQ(scalar("count"), 3);
  std::filesystem::remove(root / "etc/tavrel/limits.plist");
  EXPECT_EQ(foldNow().waiting, 0U);
}

TEST_F(FoldTest, SegmentsWhosePositionsWouldTakeTooMuchWait) {
  run([] { add(1); });
  std::array<std::byte, 256> head;
  SegmentFile(Descriptor(open(segments().at(0).c_str(), O_RDONLY | O_CLOEXEC)).get()).read(0, head);
  std::filesystem::remove(segments().at(0));
  const std::uint32_t cellsUsed = kBHCellCount;
  // Cells that an earlier store took: only their position is new.
  std::string cells(std::size_t{kBHCellCount} * kBHCellBytes, '\1');
  std::vector<Descriptor> writers;
  for (std::uint64_t number = 1; number <= 9; ++number) {
    storeLittle64(head, kBHHeaderIdentity, number);
    const auto path = folder / (std::to_string(number) + ".segment");
    writers.emplace_back(open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600));
    const int file = writers.back().get();
    ASSERT_EQ(ftruncate(file, kBHSegmentBytes), 0);
    ASSERT_EQ(pwrite(file, head.data(), head.size(), 0), std::ssize(head));
    ASSERT_EQ(pwrite(file, &cellsUsed, sizeof cellsUsed, kBHHeaderCellsUsed), 4);
    ASSERT_EQ(pwrite(file, cells.data(), cells.size(), kBHCells), std::ssize(cells));
  }
  Lines expected{"segments of user " + std::to_string(geteuid()) +
                 " wait: what must be remembered of segments that are in use exceeds 1 MiB; record "
                 "fewer keys, or from fewer programs at a time"};
  for (int fold = 0; fold < 2; ++fold, expected.clear()) {
    EXPECT_EQ(foldNow().waiting, 3U);  // each position has 163,864 bytes, of 1 MiB
    EXPECT_EQ(log.lines, expected);
  }
  writers.clear();
  EXPECT_EQ(foldNow().removed, 9U);
}

TEST_F(FoldTest, AFolderReadInPartLosesNoPosition) {
  const pid_t children[] = {startWriter(), startWriter()};
  EXPECT_EQ(foldNow().scalars, 2U);
  readableEntries = 3;  // ".", ".." and one of the segments
  const FoldReport report = foldNow();
  readableEntries = INT_MAX;
  EXPECT_EQ(report.failure, "cannot list " + folder.string() + ": Input/output error");
  EXPECT_EQ(foldNow().scalars, 0U);
  look();
  EXPECT_EQ(scalar("count"), 2);
  for (const pid_t child : children)
    waitFor(child, SIGKILL);
}

TEST_F(FoldTest, TheFolderItselfAndItsRightsAreNamed) {
  for (int i = 0; i < 3; ++i)
    run([] { add(1); });
  const std::ofstream other(folder / "other");
  auto opened = SegmentFolder::open(DeviceRoot(root));
  const auto listing = (*opened)->list(3);
  EXPECT_FALSE(listing->isWhole);
  EXPECT_EQ(listing->refusals.at(0),
            folder.string() +
                " has more than 3 files: the rest is not folded; remove files that are not "
                "segments");
  EXPECT_TRUE((*opened)->list(4)->isWhole);

  // A segment that cannot be opened now is not refused.
  const auto segment = (*opened)->list()->segments.at(0);
  rlimit files{};
  getrlimit(RLIMIT_NOFILE, &files);
  const rlimit none{0, files.rlim_max};
  setrlimit(RLIMIT_NOFILE, &none);
  const auto opening = (*opened)->openSegment(segment);
  setrlimit(RLIMIT_NOFILE, &files);
  ASSERT_FALSE(opening);
  EXPECT_EQ(opening.error().message,
            "cannot open " + segments().at(0) +
                ": Too many open files; raise the number of files that a process may open "
                "(ulimit -n)");
  if (geteuid() == 0) {
    ASSERT_EQ(seteuid(65534), 0);
    const auto closed = (*opened)->openSegment(segment);
    ASSERT_EQ(seteuid(0), 0);
    const std::string name = segments().at(0).substr(folder.string().size() + 1);
    EXPECT_EQ(closed->refusal,
              "\"" + name + "\" in " + folder.string() +
                  " is refused: Permission denied; let the user that folds read it");
  }
  std::string elsewhere = TAVREL_BUILD "/not-in-memory-XXXXXX";
  ASSERT_NE(mkdtemp(elsewhere.data()), nullptr);
  std::filesystem::create_directories(elsewhere + "/run/tavrel/stat");
  EXPECT_EQ(
      SegmentFolder::open(DeviceRoot(elsewhere)).error().message,
      elsewhere + "/run/tavrel/stat is not on a tmpfs: nothing is folded; mount a tmpfs there");
  std::filesystem::remove_all(elsewhere);
}

TEST_F(FoldTest, AnotherFileOfTheNameIsLeftAlone) {
  run([] { add(1); });
  const auto opened = SegmentFolder::open(DeviceRoot(root));
  const auto opening = (*opened)->openSegment((*opened)->list()->segments.at(0));
  const auto& segment = opening->segment;
  EXPECT_TRUE((*opened)->openToAcknowledge(*segment));
  const std::string path = segments().at(0);
  std::filesystem::copy_file(path, root / "copy");
  std::filesystem::rename(root / "copy", path);
  EXPECT_FALSE((*opened)->openToAcknowledge(*segment));
  EXPECT_FALSE((*opened)->remove(*segment));
}

}  // namespace
}  // namespace tavrel
