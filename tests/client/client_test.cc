#include "brimhold/client.hpp"

#include <algorithm>
#include <barrier>
#include <cstring>
#include <dlfcn.h>
#include <grp.h>
#include <pthread.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/time.h>
#include <thread>

#include "base/format.h"
#include "base/text.h"
#include "recording.h"

namespace tavrel {
namespace {

constexpr int kThreads = 8;
constexpr int kPerThread = 40'000;

auto openDescriptors() {
  const std::filesystem::directory_iterator entries("/proc/self/fd");
  return std::distance(entries, {});
}

TEST_F(Recording, CountsOfManyThreadsAreExactWhileTheyAreFolded) {
  const pid_t child = start([] {
    keys();
    // All threads begin a segment at the same time, and then name their first key in it.
    std::barrier together(kThreads);
    whileFetching = [&] {
      thread_local int fetches = 0;
      if (++fetches <= 2) together.arrive_and_wait();
    };
    recordInThreads(kThreads, kPerThread);
  });
  int status = 0;
  while (waitpid(child, &status, WNOHANG) == 0)
    fold();
  EXPECT_EQ(status, 0);
  fold();
  EXPECT_EQ(scalar("count"), kThreads * kPerThread);
  expectEachOnce(std::size_t{kThreads} * kPerThread, dropped);
  EXPECT_GT(records["series"].size(), std::size_t{kBHChunkCount} * kBHChunkRecords / 2);
  EXPECT_TRUE(segments().empty());
}

TEST_F(Recording, AChildRecordsIntoASegmentOfItsOwn) {
  run([&] {
    add(1);
    record(1);
    const Gate recorded, left;
    // As after clone, no handlers of the library run here: the first value must detach the child.
    if (_Fork() == 0) {
      if (_Fork() == 0) {
        // The middle process is a parent that ends first, like that of a daemon.
        left.wait();
        add(10);
        record(2);
        recorded.open();
        pause();
      }
      _exit(0);
    }
    wait(nullptr);
    left.open();
    recorded.wait();
    EXPECT_EQ(segments().size(), 2U);
  });
  const auto both = segments();
  ASSERT_EQ(both.size(), 2U);
  EXPECT_EQ(writerOf(both[0]), WriterPresence::Gone);  // although the child lives
  EXPECT_EQ(writerOf(both[1]), WriterPresence::Present);
  const Descriptor file(open(both[1].c_str(), O_RDONLY));
  kill(static_cast<pid_t>(SegmentFile(file.get()).facts().pid), SIGKILL);
  while (writerOf(both[1]) == WriterPresence::Present) {
  }
  fold();
  EXPECT_EQ(scalar("count"), 11);
  EXPECT_EQ(records["series"], (std::vector<double>{1, 2}));
}

TEST_F(Recording, AChildWithoutValuesHoldsNoSegment) {
  const Gate forked, seen;
  run([&] {
    add(1);
    // Only for root can the library have mapped something there.
    EXPECT_EQ(msync(nullptr, 1, MS_ASYNC), -1) << "something is mapped where no segment was";
    if (fork() == 0) {
      forked.open();
      seen.wait();
    } else {
      forked.wait();
    }
  });
  EXPECT_EQ(writerOf(segments().at(0)), WriterPresence::Gone);
  seen.open();
}

TEST_F(Recording, AChildMadeWithinACallRecordsForItself) {
  auto& done = shared<std::atomic<int>>();
  // Calls, and how often each allocates. The first time is for the segment, when signals wait.
  const std::pair<void (*)(), int> cases[] = {{[] { add(1); }, 4}, {[] { record(1); }, 7}};
  for (const auto& [call, fetches] : cases) {
    for (int at = 2; at <= fetches; ++at) {
      SCOPED_TRACE(at);
      done = 0;
      run([&, &call = call] {
        keys();
        int left = at;
        pid_t child = -1;
        int own = 0;
        // As in a signal handler. The call that it interrupts is recorded only in the parent.
        whileFetching = [&] {
          if (--left == 0) child = fork();
          if (left == 0 && child == 0) own = -1;
        };
        for (int i = 0; i < 2000; ++i, ++own)
          call();
        done += own;
        BHClientScalarAdd(BHClientScalarForKey(child == 0 ? "child" : "parent"), 1);
        EXPECT_TRUE(child == 0 || waitFor(child) == 0);
      });
      scalars.clear();
      records.clear();
      fold();
      ASSERT_EQ(scalar("count") + std::ssize(records["series"]), done);
      ASSERT_EQ(scalar("child"), 1);
      ASSERT_EQ(scalar("parent"), 1);
      ASSERT_TRUE(segments().empty());
    }
  }
}

TEST_F(Recording, EachValueBelongsToTheDayThatTheClockShows) {
  const pid_t child = untilItStops(start([&] {
    const std::int64_t midnight = (kToday + 1) * 86'400;
    for (const std::int64_t now : {midnight - 1, midnight, midnight - 86'401, midnight + 86'399,
                                   midnight + 86'400, midnight - 1}) {
      testClock().realtime = now;
      add(1);
      record(static_cast<double>(now));
    }
    kill(getpid(), SIGSTOP);
    // The cells of past days have been folded and now serve other days.
    for (const std::int64_t day : {1, 2, 1, 7}) {
      testClock().realtime = midnight + day * 86'400;
      add(100);
    }
  }));
  fold();
  EXPECT_EQ(waitFor(child, SIGCONT), 0);
  const Descriptor file(open(segments().at(0).c_str(), O_RDONLY));
  EXPECT_EQ(SegmentFile(file.get()).word32(kBHHeaderCellsUsed), 4U);
  fold();
  const Scalars expected{{{"count", kToday - 1}, 1},   {{"count", kToday}, 2},
                         {{"count", kToday + 1}, 2},   {{"count", kToday + 2}, 201},
                         {{"count", kToday + 3}, 100}, {{"count", kToday + 8}, 100}};
  EXPECT_EQ(scalars, expected);
  for (std::size_t i = 0; i < seconds.size(); ++i)
    EXPECT_EQ(static_cast<double>(seconds[i]), records["series"][i]);
  EXPECT_EQ(seconds.size(), 6U);
}

TEST_F(Recording, ValuesOfAnImpossibleClockAreDatedOnceItIsSet) {
  run([] {
    for (const std::int64_t sinceBoot : {99, 100, 101}) {
      testClock().realtime = 1000 + sinceBoot;
      testClock().boot = sinceBoot;
      add(sinceBoot);
      set(sinceBoot);
      record(static_cast<double>(sinceBoot));
    }
    testClock().realtime = kToday * 86'400 + 2;
    add(1000);
    record(1000);
  });
  boot = std::nullopt;
  fold();
  EXPECT_EQ(scalar("count"), 1000);
  EXPECT_TRUE(records.empty());  // in order
  EXPECT_EQ(segments().size(), 1U);

  boot = kToday * 86'400 - 100;
  fold();
  EXPECT_EQ(scalars, (Scalars{{{"count", kToday - 1}, 99},
                              {{"count", kToday}, 1000 + 100 + 101},
                              {{"gauge", kToday - 1}, 99},
                              {{"gauge", kToday}, 101}}));
  constexpr std::int64_t kSecond = 1'000'000'000;
  EXPECT_EQ(setTimes, (std::vector<std::int64_t>{(*boot + 99) * kSecond, (*boot + 100) * kSecond,
                                                 (*boot + 101) * kSecond}));
  EXPECT_EQ(seconds,
            (std::vector<std::int64_t>{*boot + 99, *boot + 100, *boot + 101, kToday * 86'400 + 2}));
  EXPECT_TRUE(segments().empty());
}

TEST_F(Recording, WithoutFreshCellsEachScalarKeepsOne) {
  const pid_t child = untilItStops(start([this] {
    testClock().realtime = testClock().coarse = 1000;
    for (int second = 1; second <= kBHCellCount - kBHKeys + 3; ++second) {
      testClock().boot = second;
      add(1);
    }
    EXPECT_EQ(BHClientGetStatus(nullptr), BHClientStatusFull);
    std::filesystem::remove(folder / "fold-wanted");
    testClock().coarse = 2000;
    int cells = kBHCellCount - kBHKeys;
    for (int day = 0; day <= kBHKeys; ++day) {
      testClock().realtime = (kToday + day) * 86'400;
      if (day == 0) set(7);
      add(1);
      cells += day == 0 ? 2 : 1;
      EXPECT_EQ(std::filesystem::exists(folder / "fold-wanted"), cells > kBHCellCount * 3 / 4);
      EXPECT_EQ(BHClientGetStatus(nullptr) == BHClientStatusRecording, day < kBHKeys - 1);
    }
    set(8);
    kill(getpid(), SIGSTOP);
    set(9);
  }));
  fold();
  EXPECT_EQ(waitFor(child, SIGCONT), 0);
  fold();
  EXPECT_EQ(scalar("count", 0), kBHCellCount - kBHKeys);  // each second needs a cell
  EXPECT_EQ(scalar("gauge"), 7);
  EXPECT_EQ(scalar("gauge", kToday + kBHKeys), 9);
  EXPECT_EQ(scalars.size(), std::size_t{kBHKeys} + 2);
  EXPECT_EQ(dropped, 6U);
}

TEST_F(Recording, AFullSegmentCountsWhatItDropsAndGoesOnAfterAFold) {
  constexpr int kRoom = kBHChunkCount * kBHChunkRecords;
  const pid_t child = untilItStops(start([&] {
    const auto isFoldWanted = [&] { return std::filesystem::exists(folder / "fold-wanted"); };
    testClock().coarse = 1000;
    close(0);  // so that the library's own files get this number
    const auto descriptors = openDescriptors();
    int i = 0;
    // Nested signal handlers record while the second chunk is being taken.
    int handlers = 2;
    whileFetching = [&] {
      if (i > kBHChunkRecords && handlers-- > 0) record(i++);
    };
    while (!isFoldWanted() && i < kRoom)
      record(i++);
    EXPECT_NEAR(i, kRoom * 0.75, 2 * kBHChunkRecords);
    std::filesystem::remove(folder / "fold-wanted");
    for (; i < kRoom + 7; ++i)
      record(i);
    EXPECT_FALSE(isFoldWanted());  // only once
    testClock().coarse += 60;
    record(i);
    EXPECT_TRUE(isFoldWanted());  // nothing has come of the first request
    std::filesystem::remove(folder / "fold-wanted");
    const char* text = nullptr;
    EXPECT_EQ(BHClientGetStatus(&text), BHClientStatusFull);
    EXPECT_STREQ(text, "the segment is full: values are dropped until a fold makes room");
    EXPECT_EQ(openDescriptors(), descriptors);
    kill(getpid(), SIGSTOP);
    EXPECT_EQ(BHClientGetStatus(nullptr), BHClientStatusRecording);
    i = 0;
    while (!isFoldWanted() && i < kRoom)
      record(i++);
    EXPECT_NEAR(i, kRoom * 0.75, 2 * kBHChunkRecords);
    EXPECT_EQ(BHClientGetStatus(nullptr), BHClientStatusRecording);
  }));
  fold();
  EXPECT_EQ(dropped, 8U);
  expectEachOnce(kRoom);
  records.clear();
  EXPECT_EQ(waitFor(child, SIGCONT), 0);
  fold();
  EXPECT_EQ(dropped, 8U);
  EXPECT_GT(records["series"].size(), std::size_t{kRoom} / 2);
  expectEachOnce(records["series"].size());
}

TEST_F(Recording, InAFolderWithManyFilesOneProgramIn127AsksForAFold) {
  for (int file = 0; file < 255; ++file)
    std::ofstream(folder / std::to_string(file)).close();
  for (const auto& [before, asks] : {std::pair(1260, false), {1260, true}, {1270, false}}) {
    testClock().monotonic = before;
    run([] { add(1); });
    EXPECT_EQ(std::filesystem::remove(folder / "fold-wanted"), asks) << segments().size();
  }
}

TEST_F(Recording, AThreadMayStillRecordIntoAChunkThatIsEmptyAgain) {
  constexpr int kCount = 4 * kBHChunkRecords;
  run([&] {
    int recorded = 0;
    int handlers = 2;
    // As in nested signal handlers, so that two chunks are taken in vain.
    whileFetching = [&] {
      if (recorded < kBHChunkRecords || handlers == 0) return;
      const bool isFirst = handlers-- == 2;
      record(recorded++);
      if (!isFirst) return;
      // What a thread does that had paused between two lines of bhPut. The spare is chunk 2.
      const Descriptor file(open(segments().at(0).c_str(), O_RDWR | O_CLOEXEC));
      const auto value = static_cast<double>(recorded++);
      std::uint64_t words[2];
      EXPECT_EQ(pread(file.get(), words, 16, kBHChunks + kBHChunkFirst), 16);
      std::memcpy(words, &value, sizeof value);
      constexpr std::uint64_t kSpare = kBHChunks + 2 * kBHChunkBytes;
      EXPECT_EQ(pwrite(file.get(), words, 16, kSpare + kBHChunkFirst), 16);
      words[0] = 1;
      EXPECT_EQ(pwrite(file.get(), words, 8, kSpare + kBHChunkReserved), 8);
    };
    while (recorded < kCount)
      record(recorded++);
  });
  fold();
  expectEachOnce(kCount);
}

TEST_F(Recording, SaysWhenItsFileIsGone) {
  for (const auto& removed : {folder / "*", std::filesystem::path(root)}) {
    run([=] {
      record(1);
      EXPECT_EQ(BHClientGetStatus(nullptr), BHClientStatusRecording);
      outputOf("rm -r " + removed.string(), 0);
      const char* text = nullptr;
      EXPECT_EQ(BHClientGetStatus(&text), BHClientStatusRemoved);
      EXPECT_STREQ(text,
                   "the process's file in /run/tavrel/stat has been removed: values are lost until "
                   "the process is restarted");
      run([] { EXPECT_NE(BHClientGetStatus(nullptr), BHClientStatusRemoved); });
    });
  }
}

TEST_F(Recording, AProcessThatChangesItsRootFolderOrUserGoesOn) {
  if (geteuid() != 0) GTEST_SKIP() << "not root";
  run([this] {
    record(1);
    EXPECT_EQ(BHClientGetStatus(nullptr), BHClientStatusRecording);
    ASSERT_EQ(chroot(root.c_str()), 0);
    record(2);
    EXPECT_EQ(BHClientGetStatus(nullptr), BHClientStatusCannotAsk);
  });
  chmod(root.c_str(), 0755);
  chmod(folder.c_str(), 01770);
  run([] {
    record(3);
    ASSERT_TRUE(setgroups(0, nullptr) == 0 && setegid(12) == 0 && seteuid(12) == 0);
    record(4);
    const char* text = nullptr;
    EXPECT_EQ(BHClientGetStatus(&text), BHClientStatusCannotAsk);
    EXPECT_STREQ(text,
                 "values are recorded until the segment is full: this process, which has changed "
                 "its user, root folder or mounts, cannot ask for a fold in /run/tavrel/stat");
    ASSERT_EQ(seteuid(0), 0);
    EXPECT_EQ(BHClientGetStatus(nullptr), BHClientStatusRecording);
  });
  fold();
  EXPECT_EQ(records["series"], (std::vector<double>{1, 2, 3, 4}));
}

TEST_F(Recording, AProcessThatMovesIsNotTakenForOneWithoutAFile) {
  run([this] {
    ASSERT_EQ(chdir(root.parent_path().c_str()), 0);
    setenv("TAVREL_ROOT", root.filename().c_str(), 1);
    record(1);
    ASSERT_EQ(chdir("/"), 0);
    EXPECT_EQ(BHClientGetStatus(nullptr), BHClientStatusRecording);
    if (unshare(CLONE_NEWNS) != 0 ||
        mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0 ||
        mount(folder.c_str(), folder.c_str(), nullptr, MS_BIND, nullptr) != 0) {
      return;
    }
    EXPECT_EQ(BHClientGetStatus(nullptr), BHClientStatusRecording);
    ASSERT_EQ(mount("none", folder.c_str(), nullptr, MS_REMOUNT | MS_BIND | MS_RDONLY, nullptr), 0);
    EXPECT_EQ(BHClientGetStatus(nullptr), BHClientStatusCannotAsk);
    ASSERT_EQ(mount("none", root.c_str(), "tmpfs", 0, nullptr), 0);
    EXPECT_EQ(BHClientGetStatus(nullptr), BHClientStatusCannotAsk);
    std::filesystem::create_directories(folder);
    EXPECT_EQ(BHClientGetStatus(nullptr), BHClientStatusCannotAsk) << "not the folder of its file";
  });
  fold();
  EXPECT_EQ(records["series"], std::vector<double>{1});
}

TEST_F(Recording, OnAnOldKernelTheWholeFileIsAllocatedAtOnceAndNoThreadCancelled) {
  run([] {
    isOldKernel = true;  // on which it calls fallocate, a cancellation point
    keys();
    pthread_t thread;
    // Without objects: ASan keeps the bounds of a frame that is left by a cancellation.
    const auto recordAndEnd = [](void*) -> void* {
      pthread_cancel(pthread_self());  // takes effect at the next cancellation point
      add(1);
      set(2);
      record(3);
      BHClientGetStatus(nullptr);
      pthread_testcancel();
      return nullptr;
    };
    ASSERT_EQ(pthread_create(&thread, nullptr, recordAndEnd, nullptr), 0);
    void* result = nullptr;
    ASSERT_EQ(pthread_join(thread, &result), 0);
    EXPECT_EQ(result, PTHREAD_CANCELED);
  });
  struct stat file;
  ASSERT_EQ(stat(segments().at(0).c_str(), &file), 0);
  EXPECT_EQ(file.st_blocks * 512, kBHSegmentBytes);
  fold();
  EXPECT_EQ(scalars, (Scalars{{{"count", kToday}, 1}, {{"gauge", kToday}, 2}}));
  EXPECT_EQ(records["series"], std::vector<double>{3});
}

TEST_F(Recording, AFullFileSystemDropsAndCounts) {
  if (mount("test", folder.c_str(), "tmpfs", 0, "size=128k") != 0) GTEST_SKIP() << "not root";
  for (const bool isLarge : {false, true}) {
    run([=] {
      largePages = isLarge;
      for (int i = 0; i < 20'000; ++i)
        record(i);
      EXPECT_EQ(BHClientGetStatus(nullptr), BHClientStatusFull);
      BHClientScalarAdd(BHClientScalarForKey("too much"), 1);
    });
    fold();
    EXPECT_GT(records["series"].size(), isLarge ? 6'700U : 7'200U);
    expectEachOnce(20'000, dropped - 1);
    EXPECT_TRUE(scalars.empty());
    records.clear();
    dropped = 0;
  }
  // The last eighth, here 4 of 32 pages, is left to others.
  for (const auto& [pages, status] :
       {std::pair(28U, BHClientStatusRecording), {29U, BHClientStatusNoSpace}}) {
    std::ofstream(folder / "others") << std::string(pages * 4096, 'x');
    run([=, expected = status] {
      add(1);
      EXPECT_EQ(BHClientGetStatus(nullptr), expected);
    });
    std::filesystem::remove(folder / "others");
    fold();
  }
  umount(folder.c_str());
}

TEST_F(Recording, SetsAndAddsHoldInTheirOrder) {
  const pid_t child = start([] {
    BHClientScalarAdd(keys().gauge, 5);
    set(100);
    for (int i = 0; i < 2; ++i) {
      BHClientScalarAdd(keys().gauge, 1);
      kill(getpid(), SIGSTOP);
    }
    set(-7);
    set(-8);
  });
  for (const std::int64_t expected : {101, 1102}) {
    waitpid(child, nullptr, WUNTRACED);
    fold();
    EXPECT_EQ(scalar("gauge"), expected);
    scalar("gauge") += 1000;  // from another program
    kill(child, SIGCONT);
  }
  EXPECT_EQ(waitFor(child), 0);
  fold();
  EXPECT_EQ(scalar("gauge"), -8);
}

TEST_F(Recording, SetsOfThreadsAreAllCounted) {
  constexpr int kSets = 50'000;
  run([] {
    set(0);
    std::vector<std::jthread> threads;
    for (int i = 0; i < 4; ++i)
      threads.emplace_back([] {
        for (int value = 0; value < kSets; ++value)
          set(value);
      });
  });
  const Descriptor file(open(segments().at(0).c_str(), O_RDONLY));
  EXPECT_EQ(SegmentFile(file.get()).word32(kBHCells + kBHCellSets), 4 * kSets + 1U);
}

std::atomic<int> numbers, handled;

TEST_F(Recording, SignalHandlersRecord) {
  int& recorded = shared<int>();
  run([&] {
    keys();
    // The first value of the process may come from a handler, in the middle of another first value.
    std::signal(SIGALRM, [](int) {
      for (int i = 0; i < 3; ++i, ++handled)
        record(numbers++);
      add(3);
    });
    const itimerval often{{0, 30}, {0, 1}};
    setitimer(ITIMER_REAL, &often, nullptr);
    for (int own = 0; handled < 3000 && own < 150'000; ++own) {
      record(numbers++);
      add(1);
    }
    std::signal(SIGALRM, SIG_IGN);
    recorded = numbers;
  });
  fold();
  EXPECT_EQ(dropped, 0U);
  EXPECT_EQ(scalar("count"), recorded);
  expectEachOnce(static_cast<std::size_t>(recorded));
}

TEST_F(Recording, WithoutAPlaceTheCallsDoNothingAndSayWhy) {
  std::string elsewhere = TAVREL_BUILD "/not-in-memory-XXXXXX";
  ASSERT_NE(mkdtemp(elsewhere.data()), nullptr);
  std::filesystem::create_directories(elsewhere + "/run/tavrel/stat");
  const std::string longest =
      std::string(4000 - sizeof "/run/tavrel/stat" - root.native().size(), '/') + root.native();
  const std::tuple<std::string, BHClientStatus, const char*> cases[] = {
      {"/dev/shm/tavrel-absent/", BHClientStatusNoFolder,
       "the device has no folder /run/tavrel/stat: nothing is recorded"},
      {elsewhere, BHClientStatusNotInMemory,
       "/run/tavrel/stat is not on a tmpfs: nothing is recorded"},
      {"/" + longest, BHClientStatusUnsupported,
       "the kernel lacks MADV_WIPEONFORK, or TAVREL_ROOT is too long or relative to a folder that "
       "is gone: nothing is recorded"},
      {longest, BHClientStatusRecording, "values are recorded"},
  };
  for (const auto& [device, status, text] : cases) {
    run([&, &device = device, &status = status, &text = text] {
      setenv("TAVREL_ROOT", device.c_str(), 1);
      EXPECT_EQ(BHClientGetStatus(nullptr), BHClientStatusNoKey);
      keys();
      errno = 77;
      for (int i = 0; i < 3; ++i) {
        add(1);
        set(1);
        record(1);
        BHClientTimerStopSeconds(BHClientTimerStart(), keys().series);
      }
      const char* said = nullptr;
      EXPECT_EQ(BHClientGetStatus(&said), status);
      EXPECT_STREQ(said, text);
      EXPECT_EQ(errno, 77);
    });
  }
  run([&] {  // a relative folder, in one that is gone
    std::filesystem::create_directory(root / "gone");
    std::filesystem::current_path(root / "gone");
    std::filesystem::remove(root / "gone");
    setenv("TAVREL_ROOT", "device", 1);
    add(1);
    EXPECT_EQ(BHClientGetStatus(nullptr), BHClientStatusUnsupported);
  });
  run([] {
    mapError = ENOMEM;
    BHClientScalarForKey("count");
    EXPECT_EQ(BHClientGetStatus(nullptr), BHClientStatusNoSpace);
    mapError = 0;
    keys();
    mapError = EAGAIN;  // as after mlockall(MCL_FUTURE)
    add(1);
    EXPECT_EQ(BHClientGetStatus(nullptr), BHClientStatusNoSpace);
  });
  EXPECT_TRUE(std::filesystem::is_empty(elsewhere + "/run/tavrel/stat"));
  EXPECT_EQ(segments().size(), 1U);
  std::filesystem::remove_all(elsewhere);
}

TEST_F(Recording, TimersMeasureSecondsAndMilliseconds) {
  run([] {
    record(0);
    testClock().monotonic = 1;
    const BHClientTimer timer = BHClientTimerStart();
    BHClientTimerStopSeconds(timer, keys().series);
    BHClientTimerStopMilliseconds(timer, keys().series);
  });
  fold();
  EXPECT_EQ(records["series"], (std::vector<double>{0, 10.1, 20'200}));
}

TEST_F(Recording, KeysAreLookedUpOnceAndRefusedWhenTheyAreNone) {
  // The first and last characters of each length.
  const char* const border =
      " ~\xc2\x80\xdf\xbf\xe0\xa0\x80\xed\x9f\xbf"
      "\xee\x80\x80\xef\xbf\xbf\xf0\x90\x80\x80\xf4\x8f\xbf\xbf";
  run([=] {
    BHClientDistributionRecord(BHClientDistributionForKey(border), 1);
    EXPECT_EQ(BHClientScalarForKey("a"), BHClientScalarForKey(std::string("a").c_str()));
    EXPECT_NE(BHClientScalarForKey("a"), BHClientScalarForKey("b"));
    EXPECT_EQ(BHClientGetStatus(nullptr), BHClientStatusRecording);
    BHClientScalarAdd(BHClientScalarForKey(std::string(1024, 'k').c_str()), 4);
    EXPECT_EQ(BHClientGetStatus(nullptr), BHClientStatusRecording);
    const std::string tooLong(1025, 'k');
    for (const char* name :
         {static_cast<const char*>(nullptr), "", tooLong.c_str(), "two\nlines", "\x7f", "\x80",
          "\xc1\x81", "\xc3", "\xc3(", "\xe0\x9f\xbf", "\xe2\x82", "\xed\xa0\x80",
          "\xf0\x8f\xbf\xbf", "\xf1\x80\x80\xc0", "\xf4\x90\x80\x80", "\xf5\x80\x80\x80"}) {
      BHClientScalarAdd(BHClientScalarForKey(name), 1);
      BHClientDistributionRecord(BHClientDistributionForKey(name), 1);
    }
    brimhold::Scalar(std::string("a\0b", 3)).add();
    brimhold::Distribution(std::string("a\0b", 3)).record(1);
    BHClientScalarSet(nullptr, 1);
    BHClientDistributionRecord(nullptr, 1);
    for (int i = 0; i < kBHKeys + 10; ++i)
      BHClientScalarAdd(BHClientScalarForKey(std::to_string(i).c_str()), i);
    EXPECT_EQ(BHClientScalarForKey("one more"), BHClientScalarForKey(nullptr));
    const char* text = nullptr;
    EXPECT_EQ(BHClientGetStatus(&text), BHClientStatusKeyRefused);
    EXPECT_STREQ(text,
                 "values are recorded, except those of a refused key: it is empty, longer than "
                 "1024 bytes, has control characters, is not UTF-8, exceeds the 4096 keys or "
                 "256 KiB of names that a process may have, or was looked up when there was no "
                 "memory");
  });
  fold();
  EXPECT_EQ(scalars.size(), std::size_t{kBHKeys - 4});  // "a", "b" and 0 leave nothing
  EXPECT_EQ(scalar(std::string(1024, 'k').c_str()), 4);
  EXPECT_EQ(scalar("4000"), 4000);
  EXPECT_EQ(records, (decltype(records){{border, {1}}}));
}

TEST_F(Recording, AWriterIsSeenUntilItsMappingIsGone) {
  const Gate executed;
  const pid_t child = untilItStops(start([&] {
    add(1);
    dup2(executed.opener(), 1);
    for (int descriptor = 3; descriptor < 1000; ++descriptor)
      close(descriptor);
    kill(getpid(), SIGSTOP);
    execlp("sh", "sh", "-c", "echo; exec sleep 1000", nullptr);
  }));
  const std::string segment = segments().at(0);
  const Descriptor file(open(segment.c_str(), O_RDONLY));
  SegmentFacts facts = SegmentFile(file.get()).facts();
  EXPECT_EQ(facts.pid, static_cast<std::uint32_t>(child));
  EXPECT_TRUE(segment.ends_with(format("-%016x.segment", child))) << segment;
  std::string bootId;
  std::ifstream("/proc/sys/kernel/random/boot_id") >> bootId;
  std::erase(bootId, '-');
  std::string inSegment;
  appendHex(inSegment, facts.boot);
  EXPECT_EQ(inSegment, bootId);
  EXPECT_EQ(writerOf(segment), WriterPresence::Present);
  EXPECT_EQ(findSegmentProcess(facts), WriterPresence::Present);
  run([&] {  // as another user, from whom /proc hides the process; if root may mount
    if (unshare(CLONE_NEWNS) != 0 ||
        mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0 ||
        mount("proc", "/proc", "proc", 0, "hidepid=2") != 0 || setgroups(0, nullptr) != 0 ||
        setgid(12) != 0 || setuid(12) != 0) {
      return;
    }
    EXPECT_EQ(access(("/proc/" + std::to_string(child)).c_str(), F_OK), -1);
    EXPECT_EQ(findSegmentProcess(facts), WriterPresence::Unknown);
  });
  kill(child, SIGCONT);
  executed.wait();
  EXPECT_EQ(writerOf(segment), WriterPresence::Gone);
  EXPECT_EQ(findSegmentProcess(facts), WriterPresence::Present) << "it runs another program";
  waitFor(child, SIGKILL);
  EXPECT_EQ(findSegmentProcess(facts), WriterPresence::Gone);

  facts.pid = 1;  // used by another process
  EXPECT_EQ(findSegmentProcess(facts), WriterPresence::Gone);
  ++facts.pidNamespace;
  EXPECT_EQ(findSegmentProcess(facts), WriterPresence::Unknown);
}

TEST_F(Recording, AWriterInAnotherPidNamespaceIsSeen) {
  const Descriptor own(open("/proc/self/ns/pid", O_RDONLY | O_CLOEXEC));
  if (unshare(CLONE_NEWPID) != 0) GTEST_SKIP() << "may not make a PID namespace";
  const Gate recorded;
  const pid_t child = start([&] {  // process 1 there
    EXPECT_EQ(getpid(), 1);
    add(7);
    recorded.open();
    pause();
  });
  ASSERT_EQ(setns(own.get(), CLONE_NEWPID), 0);  // for the children of later tests
  recorded.wait();
  const std::string segment = segments().at(0);
  const Descriptor file(open(segment.c_str(), O_RDONLY));
  const SegmentFacts facts = SegmentFile(file.get()).facts();
  EXPECT_EQ(facts.pid, 1U);
  EXPECT_EQ(findSegmentProcess(facts), WriterPresence::Unknown);
  EXPECT_EQ(writerOf(segment), WriterPresence::Present);
  fold();
  EXPECT_EQ(scalar("count"), 7);
  EXPECT_EQ(segments().size(), 1U);
  waitFor(child, SIGKILL);
  fold();
  EXPECT_EQ(scalar("count"), 7);
  EXPECT_TRUE(segments().empty());
}

TEST_F(Recording, TheSharedLibraryStaysWhenItIsClosed) {
  testClock().realtime = 0;  // the library sees the real clock
  run([] {
    void* const library = dlopen(TAVREL_BUILD "/client/libbrimhold.so.1", RTLD_NOW | RTLD_LOCAL);
    ASSERT_NE(library, nullptr) << dlerror();
    const auto keyFor = reinterpret_cast<decltype(&BHClientDistributionForKey)>(
        dlsym(library, "BHClientDistributionForKey"));
    const auto recordInto = reinterpret_cast<decltype(&BHClientDistributionRecord)>(
        dlsym(library, "BHClientDistributionRecord"));
    BHClientDistributionKey* const key = keyFor("closed");
    std::atomic<int> step = 0;
    std::thread other([&] {
      recordInto(key, 1);  // has its own memory in the library
      step = 1;
      while (step != 2)
        sched_yield();
      recordInto(key, 3);
    });
    while (step != 1)
      sched_yield();
    EXPECT_EQ(dlclose(library), 0);
    recordInto(key, 2);
    step = 2;
    other.join();
    void* const again = dlopen(TAVREL_BUILD "/client/libbrimhold.so.1", RTLD_NOW | RTLD_NOLOAD);
    EXPECT_NE(again, nullptr);
    EXPECT_EQ(keyFor("closed"), key);
  });
  fold();
  auto& values = records["closed"];
  std::sort(values.begin(), values.end());
  EXPECT_EQ(values, (std::vector<double>{1, 2, 3}));
}

}  // namespace
}  // namespace tavrel
