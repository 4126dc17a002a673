// Folds of real segments into a real store.

#include <random>
#include <sys/mount.h>
#include <sys/resource.h>
#include <thread>

#include "base/format.h"
#include "base/limits.h"
#include "folding.h"
#include "tests/helpers/killed_process.h"

namespace tavrel {
namespace {

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
  waitFor(child, SIGKILL);
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
        static_cast<std::size_t>(calls), [&] { foldNow(); },
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
        set(i);
        progress.store(i + 1, std::memory_order_release);
      }
      pause();
    });
    const int until = static_cast<int>(random() % 3000);
    while (progress < until)
      sched_yield();
    if (round % 2 == 0) foldNow();
    EXPECT_EQ(waitFor(child, SIGKILL), SIGKILL);
    ASSERT_FALSE(foldNow().failure);
    ASSERT_TRUE(segments().empty());
    look();
    const auto& values = records["series"];
    ASSERT_NO_FATAL_FAILURE(expectEachOnce(values.size()));
    const std::int64_t done = progress;
    const std::int64_t last = done > 0 ? scalar("gauge") + 1 : done;
    for (const std::int64_t left : {std::int64_t{std::ssize(values)}, scalar("count"), last})
      ASSERT_TRUE(left == done || left == done + 1) << left << " of " << done;
  }
}

// Folded cells are reused for another day. The store that knew how far folding had come is lost.
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
    recorders.push_back(
        start([=] { recordInThreads(kThreads, kPerThread, process * kThreads * kPerThread); }));
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
  std::ofstream(folder / "fold-wanted").flush();
  EXPECT_EQ(
      foldNow().failure,
      "cannot lock " + path +
          ": another process has had it locked for 600 seconds; it is folding: try again later");
  EXPECT_FALSE(std::filesystem::exists(folder / "fold-wanted"));
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

TEST_F(FoldTest, AReportAfterAFailedFoldIsIncomplete) {
  run([] { add(7); });
  const auto lock = root / "run/tavrel/fold.lock";
  std::filesystem::create_directories(lock);
  LinuxPlatform device(DeviceRoot(root), {.log = &log});
  StatisticsStore& statistics = device.platform().statistics;
  for (const bool isFolded : {false, true}) {
    if (isFolded) std::filesystem::remove(lock);
    statistics.BHClientCheckpoint();
    EXPECT_EQ(statistics.initWithDefaultPath()->scalarsForKeyPrefix("", kToday - 1, kToday,
                                                                    [](auto, auto, auto, auto&) {}),
              isFolded);
  }
}

TEST_F(FoldTest, WhatWaitsIsSeenAsAFoldWouldLeaveIt) {
  constexpr std::int64_t days[] = {kToday, kToday - 400, 2'932'896, kToday};
  const pid_t child = start([&] {
    for (int round = 0; round < 4; ++round) {
      testClock().realtime = days[round] * 86'400 + (round % 2) * std::int64_t{86'399};
      for (int i = 0; i < 2500; ++i)  // more than are read at once
        record(round * 10'000 + i);
      add(10);
      set(round);
      BHClientDistributionRecord(BHClientDistributionForKey("a"), round);
      BHClientScalarAdd(BHClientScalarForKey("z"), round);
      kill(getpid(), SIGSTOP);
    }
  });
  for (int round = 0; round < 4; ++round) {
    untilItStops(child);
    look(true);
    const auto seen = std::pair(scalars, records);
    EXPECT_EQ(scalar("count", days[round]), round < 3 ? 10 : 20);
    const bool isFolded = round > 0;  // so two days wait at once
    if (isFolded) {
      EXPECT_EQ(foldNow().values, round == 1 ? 5002U : 2501U);
    }
    for (const bool alsoWaiting : {!isFolded, true}) {
      look(alsoWaiting);
      EXPECT_EQ(std::pair(scalars, records), seen);
    }
    kill(child, SIGCONT);
  }
  EXPECT_EQ(waitFor(child), 0);
}

TEST_F(FoldTest, ALookSaysWhatItCouldNotShow) {
  const pid_t child = startWriter();
  foldNow();
  LinuxPlatform device(DeviceRoot(root), {.log = &log});
  const auto warnings = [&] {
    return RecordedHistory::open(DeviceRoot(root), device.store(), Recorders(), {.key = ""})
        ->warnings();
  };
  using Lines = std::vector<std::string>;
  EXPECT_EQ(warnings(), Lines());
  testClock().whenRead = [] {  // touch the mark as a fold does
    static timespec times[2];
    ++times[1].tv_sec;
    utimensat(AT_FDCWD, (getenv("TAVREL_ROOT") + std::string("/run/tavrel/fold.lock")).c_str(),
              times, 0);
  };
  EXPECT_EQ(warnings(),
            Lines{"folds took values during each attempt to read them, and some are not "
                  "shown: run it again"});
  testClock().whenRead = nullptr;
  connection().execute("UPDATE segments SET position = x'63000000'");  // from another version
  EXPECT_EQ(warnings(),
            Lines{"1 segment with values that wait is not shown: run 'tavrelctl stat fold'"});
  waitFor(child, SIGKILL);
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

  // The kernel writes only what the limit leaves room for.
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
    run([&] {
      set(amount);
      BHClientScalarAdd(keys().gauge, 1);  // goes with its set
    });
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
  EXPECT_EQ(scalar("count"), 3);  // the largest amount did not fit on top of the first
  run([] { add(INT64_MAX); });
  EXPECT_EQ(foldNow().refused, 1U);
  look();
  EXPECT_EQ(scalar("count"), 3);  // nor on top of what the store held
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
  EXPECT_FALSE(foldNow().failure);
  EXPECT_EQ(log.lines.size(), 1U) << "the damaged store is set aside";
  look();
  EXPECT_EQ(scalar("count"), 1);
  EXPECT_TRUE(segments().empty());
}

TEST_F(FoldTest, AStoreDamagedWhereOnlyFoldsLookIsSetAside) {
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
      file.seekg(34);  // the low half of its first page's number
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

TEST_F(FoldTest, ValuesWithoutADateWaitForTheClock) {
  for (int i = 0; i < 2; ++i)
    run([] { BHClientScalarAdd(keys().gauge, INT64_MAX); });
  testClock().realtime = 1000;
  testClock().boot = 100;
  run([] {
    add(1);
    record(0);
  });
  const Descriptor segment(open(segments().back().c_str(), O_WRONLY | O_CLOEXEC));
  const std::uint64_t lost = 7;
  EXPECT_EQ(pwrite(segment.get(), &lost, sizeof lost, kBHHeaderDropped), 8);
  std::ofstream(folder / "junk").close();
  FoldReport report = foldNow();
  EXPECT_EQ(report.refused, 1U);  // the sum does not fit
  EXPECT_EQ(report.removed, 2U);
  EXPECT_EQ(report.dropped + report.segmentsRefused, 0U);
  testClock().realtime = kToday * 86'400;
  report = foldNow();
  EXPECT_EQ(report.dropped, 7U);
  EXPECT_EQ(report.segmentsRefused, 1U);
  look();
  EXPECT_EQ(scalar("com.norvane.brimhold.segments_refused", kToday), 1);
  EXPECT_EQ(scalar("com.norvane.brimhold.refused", kToday), 1);
  EXPECT_EQ(scalar("count", kToday), 1);
  expectEachOnce(1);
}

TEST_F(FoldTest, AProgramNoticesThatAFullFileSystemHasRoomAgain) {
  if (mount("test", folder.c_str(), "tmpfs", 0, "size=4k") != 0) GTEST_SKIP() << "not root";
  const pid_t child = start([] {
    for (const BHClientStatus status :
         {BHClientStatusFull, BHClientStatusFull, BHClientStatusRecording}) {
      add(1);
      EXPECT_EQ(BHClientGetStatus(nullptr), status);
      kill(getpid(), SIGSTOP);
    }
  });
  waitpid(child, nullptr, WUNTRACED);
  for (const bool isFoldWanted :
       {true, false}) {  // a fold that made no room is not asked for again
    EXPECT_EQ(std::filesystem::exists(folder / "fold-wanted"), isFoldWanted);
    if (!isFoldWanted) {
      EXPECT_EQ(mount("test", folder.c_str(), "tmpfs", MS_REMOUNT, "size=64k"), 0);
    }
    EXPECT_EQ(foldNow().dropped, 1U);
    kill(child, SIGCONT);
    waitpid(child, nullptr, WUNTRACED);
  }
  EXPECT_EQ(waitFor(child, SIGCONT), 0);
  umount(folder.c_str());
}

}  // namespace
}  // namespace tavrel
