// Folds of real segments into a real store.

#include <algorithm>
#include <array>
#include <cstdlib>
#include <fstream>
#include <random>
#include <set>
#include <sys/mount.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/vfs.h>
#include <thread>

#include "base/bytes.h"
#include "base/format.h"
#include "base/limits.h"
#include "platform/linux/folding/recorded_history.h"
#include "platform/linux/folding/segment_fold.h"
#include "platform/linux/folding/segment_folder.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/store/sqlite_schema.h"
#include "platform/linux/store/sqlite_store.h"
#include "platform/platform.h"
#include "recording.h"
#include "tests/system/killed_process.h"

namespace tavrel {
namespace {

using Lines = std::vector<std::string>;

int fromEnvironment(const char* name, int otherwise) {
  const char* const text = std::getenv(name);  // for long runs by hand
  return text ? static_cast<int>(std::strtol(text, nullptr, 10)) : otherwise;
}

class FoldTest : public Recording {
 protected:
  struct KeptLog final : SystemLog {
    void write(LogLevel, std::string_view message) override { lines.emplace_back(message); }
    Lines lines;
  };

  FoldTest() {
    chmod(root.c_str(), 0755);
    chmod(folder.c_str(), 01777);
  }

  FoldReport foldNow() {
    log.lines.clear();
    LinuxPlatform device(DeviceRoot(root), {.log = &log});
    SqliteStore impatient(device.root(), device.platform().clock, device.platform().preferences,
                          log, 20);
    return SegmentFold(device.root(), impatient, device.fileSystem(),
                       device.platform().propertyLists, log)
        .run();
  }
  /// What the store holds, and what waits too if wanted.
  void look(bool alsoWaiting = false) {
    scalars.clear();
    records.clear();
    std::set<std::int32_t> days;
    KeptLog own;
    LinuxPlatform device(DeviceRoot(root), {.log = &own});
    const DeviceRoot place(alsoWaiting ? root.string() : "/nowhere");
    auto history = RecordedHistory::open(place, device.store(), Recorders(),
                                         {.key = "", .firstDay = INT32_MIN, .lastDay = INT32_MAX});
    ASSERT_TRUE(history) << history.error().message;
    ASSERT_TRUE(history->walkScalars([&](auto key, auto day, auto value, bool&) {
      EXPECT_TRUE(scalars.emplace(std::pair(key, day), value).second) << key;
      days.insert(day);
    }));
    ASSERT_TRUE(
        history->walkDistributions([&](auto key, auto day, auto count, auto& values, bool&) {
          days.insert(day);
          double value = 0;
          std::uint32_t second = 0;
          auto& row = records[std::string(key)];
          const std::size_t before = row.size();
          while (values.getNextValue(value, second))
            row.push_back(value);
          EXPECT_EQ(row.size() - before, static_cast<std::size_t>(count)) << key;
        }));
    const auto held = history->daysHeld();
    ASSERT_TRUE(held && held->has_value() == !days.empty());
    if (!*held) return;
    EXPECT_EQ(std::pair((*held)->first, (*held)->last), std::pair(*days.begin(), *days.rbegin()));
  }
  std::int64_t figure(const char* name) {
    const std::string key = std::string("com.norvane.brimhold.") + name;
    std::int64_t sum = 0;  // under the day of the machine's clock
    for (const auto& [row, value] : scalars)
      if (row.first == key) sum += value;
    return sum;
  }
  /// All numbers from 0 up.
  void expectEachOnce(std::size_t count) {
    auto& values = records["series"];
    std::sort(values.begin(), values.end());
    ASSERT_EQ(values.size(), count);
    std::size_t wrong = 0;
    for (std::size_t i = 0; i < count; ++i)
      if (values[i] != static_cast<double>(i)) ++wrong;
    ASSERT_EQ(wrong, 0U);
  }
  std::filesystem::path store() { return LinuxPlatform(DeviceRoot(root)).store().path(); }

  KeptLog log;
};

TEST_F(FoldTest, AKillAtAnySystemCallLosesAndRepeatsNothing) {
  auto& recorded = shared<std::atomic<int>>();
  const Gate wanted;
  const pid_t child = start([&] {
    for (;;) {
      wanted.wait();
      add(1);
      for (int i = 0; i < 30; ++i)
        record(recorded++);
      kill(getpid(), SIGSTOP);
    }
  });
  int total = 0;
  for (std::size_t calls = 0;; ++calls) {
    SCOPED_TRACE(calls);
    wanted.open();
    waitpid(child, nullptr, WUNTRACED);
    kill(child, SIGCONT);
    run([&] {
      add(1);
      record(recorded++);
      set(static_cast<std::int64_t>(calls));
    });
    total += 2;
    const bool isKilled = runUntilSystemCall(calls, [&] { foldNow(); });
    run([&] { EXPECT_FALSE(foldNow().failure) << *foldNow().failure; });
    look();
    ASSERT_EQ(scalar("count"), total);
    ASSERT_EQ(scalar("gauge"), calls);
    ASSERT_NO_FATAL_FAILURE(expectEachOnce(static_cast<std::size_t>(recorded)));
    ASSERT_EQ(segments().size(), 1U);
    if (!isKilled) {
      EXPECT_GT(calls, 150U);
      break;
    }
  }
  kill(child, SIGKILL);
  waitFor(child);
  EXPECT_EQ(foldNow().removed, 1U);
}

TEST_F(FoldTest, ASegmentThatBeginsDuringAFoldIsTakenOnce) {
  run([] { add(1); });
  const auto model = root / "model";
  std::filesystem::rename(segments().at(0), model);
  const auto path = folder / "new.segment";
  int total = 0;
  for (std::uint64_t calls = 0;; calls += 3) {
    SCOPED_TRACE(calls);
    std::filesystem::copy_file(model, path, std::filesystem::copy_options::overwrite_existing);
    const Descriptor file(open(path.c_str(), O_RDWR | O_CLOEXEC));
    const auto write = [&](std::uint64_t offset, std::span<const std::uint64_t> words) {
      const auto size = std::ssize(std::as_bytes(words));
      EXPECT_EQ(pwrite(file.get(), words.data(), words.size_bytes(), static_cast<off_t>(offset)),
                size);
    };
    write(kBHHeaderMagic, {{0}});
    write(kBHHeaderIdentity, {{0, 0}});
    const bool isStopped = runUntilSystemCall(
        calls, [&] { foldNow(); },
        [&] {
          write(kBHHeaderIdentity, {{calls, 1}});
          write(kBHHeaderMagic, {{kBHSegmentMagic}});
        });
    if (!isStopped) break;
    ASSERT_FALSE(foldNow().failure);
    look();
    ASSERT_EQ(scalar("count"), ++total);
  }
  EXPECT_GT(total, 30);
}

TEST_F(FoldTest, AKilledProgramLosesAndRepeatsNothing) {
  auto& progress = shared<std::atomic<int>>();
  std::mt19937 random(7);
  for (int round = fromEnvironment("TAVREL_KILL_ROUNDS", 20); round > 0; --round) {
    SCOPED_TRACE(round);
    progress = 0;
    std::filesystem::remove_all(root / "var");
    const pid_t child = start([&] {
      for (int i = 0; i < 20'000; ++i) {
        record(i);
        add(1);
        progress.store(i + 1, std::memory_order_release);
      }
      pause();
    });
    const int until = static_cast<int>(random() % 3000);
    while (progress < until)
      sched_yield();
    if (round % 2 == 0) foldNow();
    kill(child, SIGKILL);
    EXPECT_EQ(waitFor(child), SIGKILL);
    ASSERT_FALSE(foldNow().failure);
    ASSERT_TRUE(segments().empty());
    look();
    const auto& values = records["series"];
    ASSERT_NO_FATAL_FAILURE(expectEachOnce(values.size()));
    const std::int64_t done = progress;
    for (const std::int64_t left : {std::ssize(values), scalar("count")})
      ASSERT_TRUE(left == done || left == done + 1) << left << " of " << done;
  }
}

TEST_F(FoldTest, EachDayKeepsWhatItsClockSaw) {
  const std::int64_t midnight = (kToday + 1) * 86'400;
  const std::int64_t days[] = {kToday, kToday + 1, kToday - 400, 2'932'896, kToday};
  const pid_t child = start([&] {
    for (const std::int64_t day : days) {
      for (const std::int64_t second : {0, 86'399}) {
        testClock().realtime = midnight + (day - kToday - 1) * 86'400 + second;
        add(1);
        record(static_cast<double>(second));
      }
      kill(getpid(), SIGSTOP);
    }
  });
  for (std::size_t i = 0; i < std::size(days); ++i) {
    waitpid(child, nullptr, WUNTRACED);
    look(true);
    if (i > 0) foldNow();  // two days wait at once
    kill(child, SIGCONT);
  }
  EXPECT_EQ(waitFor(child), 0);
  foldNow();
  look();
  EXPECT_EQ(scalars, (Scalars{{{"count", kToday - 400}, 2},
                              {{"count", kToday}, 4},
                              {{"count", kToday + 1}, 2},
                              {{"count", 2'932'896}, 2}}));
  EXPECT_EQ(records["series"].size(), 10U);
}

// The process gives cells another day once they are folded. The store that knew how far is lost.
TEST_F(FoldTest, ALostStoreMakesNoDayOfEarlierOnes) {
  constexpr int kDays = 6;
  const pid_t child = start([&] {
    for (int day = 0; day < kDays; ++day) {
      testClock().realtime = (kToday + day) * 86'400;
      add(100);
      record(day);
      kill(getpid(), SIGSTOP);
    }
  });
  for (int day = 0; day < kDays; ++day) {
    waitpid(child, nullptr, WUNTRACED);
    if (day == kDays - 2) {
      std::ofstream(store(), std::ios::trunc) << std::string(9999, 'x');
      std::filesystem::remove(store().string() + "-wal");
    }
    EXPECT_EQ(foldNow().refused, day == kDays - 2 ? 2U : 0U);
    kill(child, SIGCONT);
  }
  EXPECT_EQ(waitFor(child), 0);
  look();
  EXPECT_EQ(scalar("count", kToday + kDays - 1), 100);
  EXPECT_EQ(figure("refused"), 2);
  EXPECT_EQ(scalars.size(), 2U);
  expectEachOnce(kDays);
}

TEST_F(FoldTest, ManyProcessesAndFoldsAtOnceAreExact) {
  const int processes = fromEnvironment("TAVREL_FOLD_PROCESSES", 6);
  const int folds = fromEnvironment("TAVREL_FOLD_FOLDS", 3);
  constexpr int kThreads = 8, kPerThread = 1000;
  auto& isOver = shared<std::atomic<bool>>();
  std::vector<pid_t> recorders, folders;
  for (int process = 0; process < processes; ++process) {
    recorders.push_back(start([=] {
      std::vector<std::thread> threads;
      for (int thread = 0; thread < kThreads; ++thread)
        threads.emplace_back([=] {
          for (int i = 0; i < kPerThread; ++i) {
            add(1);
            record((process * kThreads + thread) * kPerThread + i);
          }
        });
      for (std::thread& thread : threads)
        thread.join();
    }));
  }
  for (int i = 0; i < folds; ++i) {
    folders.push_back(start([&] {
      while (!isOver)
        foldNow();
    }));
  }
  for (const pid_t child : recorders)
    EXPECT_EQ(waitFor(child), 0);
  isOver = true;
  for (const pid_t child : folders)
    EXPECT_EQ(waitFor(child), 0);
  EXPECT_FALSE(foldNow().failure);
  look();
  EXPECT_EQ(scalar("count"), processes * kThreads * kPerThread);
  expectEachOnce(static_cast<std::size_t>(processes) * kThreads * kPerThread);
  EXPECT_EQ(figure("dropped"), 0);
  EXPECT_TRUE(segments().empty());
}

TEST_F(FoldTest, WaitsMinutesForAnotherFold) {
  run([] { add(7); });
  const std::string path = root / "run/tavrel/fold.lock";
  Expected<Descriptor> other = FileSystem().lockFile(path);
  ASSERT_TRUE(other);
  testClock().monotonic = 1;
  EXPECT_EQ(
      foldNow().failure,
      "cannot lock " + path +
          ": another process has had it locked for 600 seconds; it is folding: try again later");
  testClock().monotonic = 1;
  std::thread end([&] {
    while (testClock().monotonic < 300)
      sched_yield();
    other = Error{};
  });
  EXPECT_FALSE(foldNow().failure);
  end.join();
  look();
  EXPECT_EQ(scalar("count"), 7);
}

TEST_F(FoldTest, WhatWaitsIsSeenAsAFoldWouldLeaveIt) {
  const pid_t child = start([] {
    for (int round = 0; round < 3; ++round) {
      for (int i = 0; i < 2500; ++i)  // more than are read at once
        record(round * 10'000 + i);
      add(10);
      set(round);
      BHClientDistributionRecord(BHClientDistributionForKey("a"), round);
      BHClientScalarAdd(BHClientScalarForKey("z"), round);
      kill(getpid(), SIGSTOP);
    }
  });
  for (int round = 0; round < 3; ++round) {
    waitpid(child, nullptr, WUNTRACED);
    look(true);
    const auto seen = std::pair(scalars, records);
    EXPECT_EQ(scalar("count"), 10 * (round + 1));
    EXPECT_EQ(foldNow().values, 2501U);
    for (const bool alsoWaiting : {false, true}) {
      look(alsoWaiting);
      EXPECT_EQ(std::pair(scalars, records), seen);
    }
    kill(child, SIGCONT);
  }
  EXPECT_EQ(waitFor(child), 0);
}

TEST_F(FoldTest, ALookSaysWhatItCouldNotShow) {
  const pid_t child = start([] {
    add(1);
    kill(getpid(), SIGSTOP);
  });
  waitpid(child, nullptr, WUNTRACED);
  foldNow();
  LinuxPlatform device(DeviceRoot(root), {.log = &log});
  const auto warning = [&] {
    return RecordedHistory::open(DeviceRoot(root), device.store(), Recorders(), {.key = ""})
        ->warning()
        .value_or("");
  };
  EXPECT_EQ(warning(), "");
  testClock().whenRead = [] {  // as a fold does
    static timespec times[2];
    ++times[1].tv_sec;
    utimensat(AT_FDCWD, (getenv("TAVREL_ROOT") + std::string("/run/tavrel/fold.lock")).c_str(),
              times, 0);
  };
  EXPECT_EQ(warning(),
            "folds took values during each attempt to read them, and some are not shown: run it "
            "again");
  testClock().whenRead = nullptr;
  openStoreForWriting(store(), std::make_shared<BusyBudget>(1000))
      .execute("UPDATE segments SET position = x'63000000'");  // of another version
  EXPECT_EQ(warning(), "1 segments with values that wait are not shown: run 'tavrelctl stat fold'");
  kill(child, SIGKILL);
  waitFor(child);
}

TEST_F(FoldTest, ASeriesThatWaitsIsReadToItsEndOrFails) {
  for (int round = 0; round < 3; ++round) {
    run([=] {
      for (int i = 0; i < 600; ++i)
        record(round * 600 + i);
    });
  }
  look(true);
  expectEachOnce(1800);

  LinuxPlatform device(DeviceRoot(root), {.log = &log});
  const auto open = [&] {
    return RecordedHistory::open(device.root(), device.store(), Recorders(),
                                 {.key = "", .firstDay = INT32_MIN, .lastDay = INT32_MAX});
  };
  auto history = open();
  for (const auto& entry : std::filesystem::directory_iterator("/proc/self/fd")) {
    std::error_code isGone;
    if (read_symlink(entry, isGone).string().starts_with("/memfd:waiting values"))
      std::filesystem::resize_file(entry, 700 * sizeof(DistributionSample));
  }
  const Status walked = history->walkDistributions([](auto, auto, auto, auto& values, bool&) {
    while (!values.nextValues().empty()) {
    }
    EXPECT_TRUE(values.failed());
  });
  ASSERT_FALSE(walked);
  EXPECT_EQ(walked.error().message, "cannot read the copy of segments: Input/output error");

  // The kernel writes what the limit leaves room for.
  signal(SIGXFSZ, SIG_IGN);
  rlimit sizes{};
  getrlimit(RLIMIT_FSIZE, &sizes);
  const rlimit few{700 * sizeof(DistributionSample), sizes.rlim_max};
  setrlimit(RLIMIT_FSIZE, &few);
  const auto none = open();
  setrlimit(RLIMIT_FSIZE, &sizes);
  signal(SIGXFSZ, SIG_DFL);
  ASSERT_FALSE(none);
  EXPECT_EQ(none.error().message, "cannot copy segments: File too large");
}

TEST_F(FoldTest, OfSetsTheLatestCountsAndAddsAreAdded) {
  const Gate later;
  const pid_t child = start([&] {  // its segment comes first
    BHClientScalarAdd(BHClientScalarForKey("other"), 1);
    later.wait();
    testClock().realtime += 10;
    set(7);
  });
  while (segments().empty())
    sched_yield();
  for (const int amount : {100, 200})
    run([&] { set(amount); });
  later.open();
  EXPECT_EQ(waitFor(child), 0);
  run([] { BHClientScalarAdd(keys().gauge, 1000); });
  EXPECT_EQ(foldNow().scalars, 5U);
  look();
  EXPECT_EQ(scalar("gauge"), 1007);
  for (const std::int64_t amount : {std::int64_t{1}, INT64_MAX, std::int64_t{2}})
    run([&] { add(amount); });
  EXPECT_EQ(foldNow().refused, 1U);
  look();
  EXPECT_EQ(scalar("count"), 3);  // the largest amount did not fit behind the first
  run([] { add(INT64_MAX); });
  EXPECT_EQ(foldNow().refused, 1U);
  look();
  EXPECT_EQ(scalar("count"), 3);  // nor what the store held
}

TEST_F(FoldTest, ASetKeepsWhatTheFoldAddedBefore) {
  run([] { BHClientScalarAdd(keys().gauge, 5); });
  for (std::size_t i = 0; i < limits::kFoldSegmentsAtOnce; ++i)
    run([] { add(1); });
  run([] { set(10); });
  foldNow();
  look();
  EXPECT_EQ(scalar("gauge"), 15);
}

TEST_F(FoldTest, UsersRecordTheirKeysAlone) {
  if (geteuid() != 0) GTEST_SKIP() << "needs root";
  std::filesystem::create_directories(root / "etc/tavrel");
  const auto file = root / "etc/tavrel/recorders.plist";
  const std::string recorders = R"(<?xml version="1.0" encoding="UTF-8"?><plist version="1.0"><dict>
<key>12</key><array><string>com.a.</string><string>com.norvane.a.</string><string>com</string></array>
<key>13</key><array><string>com.a.b.</string></array><key>nobody-here</key><array/>
<key>14</key><string>com.</string></dict></plist>)";
  const Lines keys{"com.a.x", "com.a.b.x", "com.norvane.a.x", "com.norvane.b", "com.b", "x"};
  const std::tuple<std::string, unsigned, uid_t, Lines, std::size_t> cases[] = {
      {recorders, 0644, 0, keys, 2},
      {recorders, 0644, 12, {"com.a.x", "com.b", "com.norvane.a.x"}, 3},
      {recorders, 0644, 13, {"com.a.b.x"}, 3},
      {recorders, 0644, 15, {"x"}, 3},
      {recorders, 0664, 15, {"com.a.b.x", "com.a.x", "com.b", "x"}, 2},
      {"<plist", 0644, 15, {"com.a.b.x", "com.a.x", "com.b", "x"}, 2},
      {"", 0644, 15, {"com.a.b.x", "com.a.x", "com.b", "x"}, 2},  // a link that leads nowhere
  };
  for (const auto& [content, mode, user, allowed, lines] : cases) {
    SCOPED_TRACE(user);
    std::filesystem::remove(file);
    if (content.empty()) {
      std::filesystem::create_symlink("nowhere", file);
    } else {
      std::ofstream(file) << content;
      chmod(file.c_str(), mode);
    }
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
    if (content.empty()) {
      EXPECT_EQ(log.lines.at(0), file.string() +
                                     " is ignored: it is a link that leads nowhere; "
                                     "repair or remove it");
    }
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
  std::sort(log.lines.begin(), log.lines.end());
  EXPECT_EQ(log.lines, expected);
  EXPECT_FALSE(std::filesystem::exists(folder / "fold-wanted"));
  std::filesystem::create_directories(folder / "fold-wanted/x");
  EXPECT_EQ(foldNow().segmentsRefused, 1U);
  EXPECT_EQ(log.lines.size(), 1U);
  EXPECT_NE(log.lines.at(0).find("\"fold-wanted-"), std::string::npos) << log.lines.at(0);
  EXPECT_FALSE(std::filesystem::exists(folder / "fold-wanted"));
  report = foldNow();  // the copy is now alone and folded, as if it had been recorded
  EXPECT_EQ(report.segmentsRefused, 0U);
  EXPECT_EQ(log.lines, Lines());
  look();
  EXPECT_EQ(figure("segments_refused"), 8);

  for (int i = 0; i < 200; ++i)
    put(std::to_string(i).c_str(), 0);
  EXPECT_EQ(foldNow().segmentsRefused, 200U);
  EXPECT_EQ(log.lines.size(), 100U - 8 + 1);  // with those of the folds before
  EXPECT_EQ(log.lines.back(), "108 more refusals of this fold are not listed");

  // Once others have taken all room to remember them, they count each time.
  std::ofstream told(root / "run/tavrel/fold.lock");
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
  EXPECT_FALSE(foldNow().failure);
  look();
  EXPECT_GE(scalar("count"), 3);
}

TEST_F(FoldTest, AStoreThatTakesNothingLetsSegmentsWait) {
  run([] { add(1); });
  const std::filesystem::path path = store();
  std::filesystem::create_directories(path.parent_path());
  const auto expectWaiting = [&](const char* reason) {
    SCOPED_TRACE(reason);
    const FoldReport report = foldNow();
    ASSERT_TRUE(report.failure);
    EXPECT_NE(report.failure->find(reason), std::string::npos) << *report.failure;
    EXPECT_TRUE(report.failure->ends_with("; what programs recorded waits for the next fold"));
    EXPECT_EQ(report.scalars + report.removed, 0U);
    EXPECT_EQ(segments().size(), 1U);
  };
  std::filesystem::create_directory(path);
  expectWaiting("is not a regular file");
  std::filesystem::remove(path);
  {
    LinuxPlatform other((DeviceRoot(root)));
    auto batch = other.store().beginBatch();
    ASSERT_TRUE((*batch)->segmentNames());
    expectWaiting("locked");
  }
  std::filesystem::remove_all(path.parent_path());
  std::filesystem::create_directory(path.parent_path());
  if (mount("test", path.parent_path().c_str(), "tmpfs", 0, "size=16k") == 0) {
    expectWaiting("space");
    umount(path.parent_path().c_str());
  }
  std::ofstream(path) << std::string(8192, 'x');
  LinuxPlatform device(DeviceRoot(root), {.log = &log});
  EXPECT_TRUE(device.platform().statistics->BHClientCheckpoint());
  EXPECT_EQ(log.lines.size(), 1U) << "the damaged store is set aside";
  look();
  EXPECT_EQ(scalar("count"), 1);
  EXPECT_TRUE(segments().empty());
}

TEST_F(FoldTest, AStoreDamagedWhereOnlyFoldsLookIsSetAside) {
  const auto connection = [&] {
    return openStoreForWriting(store(), std::make_shared<BusyBudget>(1000));
  };
  for (const char* damaged : {"segments", "list of free pages"}) {
    SCOPED_TRACE(damaged);
    std::filesystem::remove_all(store().parent_path());
    run([] { add(1); });
    ASSERT_FALSE(foldNow().failure);
    auto open = connection();
    open.execute("CREATE TABLE t (b); INSERT INTO t VALUES (zeroblob(99999)); DROP TABLE t");
    ASSERT_TRUE(open.checkpoint());
    std::fstream file(store());
    std::int64_t page =
        open.integer(format("SELECT rootpage FROM sqlite_schema WHERE name = '%s'", damaged));
    if (page == 0) {
      file.seekg(34);  // the lower half of its first page
      page = file.get() * 256 + file.get();
    }
    ASSERT_GT(page, 1);
    file.seekp((page - 1) * 4096) << std::string(4096, '\xff');
    file.close();
    run([] {
      add(2);
      for (int i = 0; i < 2000; ++i)
        record(i);
    });
    std::ofstream(folder / damaged) << "no segment";
    const FoldReport report = foldNow();
    EXPECT_FALSE(report.failure) << *report.failure;
    EXPECT_EQ(report.segmentsRefused, 1U);
    EXPECT_EQ(std::ranges::count_if(log.lines,
                                    [](const std::string& line) {
                                      return line.find(" and a new store begins") !=
                                             std::string::npos;
                                    }),
              1);
    look();
    EXPECT_EQ(scalar("count"), 2);
    EXPECT_EQ(figure("segments_refused"), 1);
    expectEachOnce(2000);
    EXPECT_TRUE(segments().empty());
  }
}

TEST_F(FoldTest, ARowThatTakesNothingRefusesItsValuesAlone) {
  const auto recordAll = [] {
    for (const char* key : {"damaged", "whole"})
      BHClientDistributionRecord(BHClientDistributionForKey(key), 1);
    add(1);
  };
  run(recordAll);
  EXPECT_EQ(foldNow().refused, 0U);
  openStoreForWriting(store(), std::make_shared<BusyBudget>(1000))
      .execute("UPDATE distributions SET count = 2 WHERE key = CAST('damaged' AS BLOB)");
  run(recordAll);
  const FoldReport report = foldNow();
  EXPECT_FALSE(report.failure) << *report.failure;
  EXPECT_EQ(report.refused, 1U);
  ASSERT_EQ(log.lines.size(), 1U);
  EXPECT_NE(log.lines[0].find("; what was recorded for \"damaged\" on day "), std::string::npos)
      << log.lines[0];
  EXPECT_TRUE(segments().empty());
  openStoreForWriting(store(), std::make_shared<BusyBudget>(1000))
      .execute("DELETE FROM distributions WHERE key = CAST('damaged' AS BLOB)");
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
  const pid_t child = start([] {
    add(1);
    kill(getpid(), SIGSTOP);
  });
  waitpid(child, nullptr, WUNTRACED);
  foldNow();
  EXPECT_EQ(held(), 1U);
  kill(child, SIGKILL);
  waitFor(child);

  // A segment that cannot be read now keeps its position.
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

  // One that was folded to its end is not read again.
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
       {kSegments - limits::kSegmentsPerUser, std::uint64_t{100}, std::uint64_t{0}})
    EXPECT_EQ(foldNow().waiting, waiting);
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
  for (int fold = 0; fold < 2; ++fold) {  // two, of 0.7 MB each, reach 1.25 MiB
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
  // Cells that an earlier store took: nothing but their position is new.
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
  for (int fold = 0; fold < 2; ++fold)
    EXPECT_EQ(foldNow().waiting, 3U);  // each position has 163,864 bytes, of 1 MiB
  writers.clear();
  EXPECT_EQ(foldNow().removed, 9U);
}

TEST_F(FoldTest, ValuesWithoutADateWaitForTheClock) {
  testClock().realtime = 1000;
  testClock().boot = 100;
  run([] {
    add(1);
    record(0);
  });
  EXPECT_EQ(foldNow().removed, 0U);
  testClock().realtime = kToday * 86'400;
  EXPECT_EQ(foldNow().removed, 1U);
  look();
  EXPECT_EQ(scalar("count", kToday), 1);
  expectEachOnce(1);
}

TEST_F(FoldTest, AProgramNoticesThatAFullFileSystemHasRoomAgain) {
  if (mount("test", folder.c_str(), "tmpfs", 0, "size=4k") != 0) GTEST_SKIP() << "not root";
  const pid_t child = start([] {
    for (const BHClientStatus status : {BHClientStatusFull, BHClientStatusRecording}) {
      add(1);
      EXPECT_EQ(BHClientGetStatus(nullptr), status);
      kill(getpid(), SIGSTOP);
    }
  });
  waitpid(child, nullptr, WUNTRACED);
  EXPECT_TRUE(std::filesystem::exists(folder / "fold-wanted"));
  EXPECT_EQ(mount("test", folder.c_str(), "tmpfs", MS_REMOUNT, "size=64k"), 0);
  EXPECT_EQ(foldNow().dropped, 1U);
  kill(child, SIGCONT);
  waitpid(child, nullptr, WUNTRACED);
  kill(child, SIGCONT);
  EXPECT_EQ(waitFor(child), 0);
  umount(folder.c_str());
}

TEST_F(FoldTest, ASegmentThatCannotBeOpenedNowIsNotRefused) {
  run([] { add(1); });
  const auto opened = SegmentFolder::open(DeviceRoot(root));
  const auto listing = (*opened)->list();
  rlimit files{};
  getrlimit(RLIMIT_NOFILE, &files);
  const rlimit none{0, files.rlim_max};
  setrlimit(RLIMIT_NOFILE, &none);
  const auto opening = (*opened)->openSegment(listing->segments.at(0));
  setrlimit(RLIMIT_NOFILE, &files);
  ASSERT_FALSE(opening);
  EXPECT_EQ(opening.error().message,
            "cannot open " + segments().at(0) +
                ": Too many open files; raise the number of files that a process may open "
                "(ulimit -n)");
}

TEST_F(FoldTest, TheFolderItselfAndItsRightsAreNamed) {
  for (int i = 0; i < 3; ++i)
    run([] { add(1); });
  std::ofstream(folder / "other");
  auto opened = SegmentFolder::open(DeviceRoot(root));
  const auto listing = (*opened)->list(3);
  EXPECT_FALSE(listing->isWhole);
  EXPECT_EQ(listing->refusals.at(0),
            folder.string() +
                " has more than 3 files: the rest is not folded; remove files that are not "
                "segments");
  EXPECT_TRUE((*opened)->list(4)->isWhole);

  if (geteuid() == 0) {
    ASSERT_EQ(seteuid(65534), 0);
    const auto closed = (*opened)->openSegment((*opened)->list()->segments.at(0));
    ASSERT_EQ(seteuid(0), 0);
    const std::string name = segments().at(0).substr(folder.string().size() + 1);
    EXPECT_EQ(closed->refusal,
              "\"" + name + "\" in " + folder.string() +
                  " is refused: Permission denied; let the user that folds read it");
  }
  const std::string elsewhere = "/tmp/tavrel-client-test";
  std::filesystem::create_directories(elsewhere + "/run/tavrel/stat");
  EXPECT_EQ(
      SegmentFolder::open(DeviceRoot(elsewhere)).error().message,
      elsewhere + "/run/tavrel/stat is not on a tmpfs: nothing is folded; mount a tmpfs there");
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
