#include <csignal>
#include <sys/resource.h>

#include "platform/linux/store/sqlite_log_file.h"
#include "platform/store_path.h"
#include "store_fixture.h"
#include "tests/helpers/killed_process.h"

namespace tavrel {
namespace {

TEST_F(StoreTest, TheClientCommitsAtTheCheckpointAndAtTheEnd) {
  EXPECT_EQ(store_->BHDaysSince1970(), kToday);
  EXPECT_EQ(store_->dateForDaysSince1970(kFirstDay).secondsSince1970(), -185542587187200.0);
  store_->BHClientCheckpoint();
  EXPECT_FALSE(std::filesystem::exists(store_->path())) << "nothing to keep, nothing made";
  EXPECT_EQ(scalarsOfToday(), Rows{});
  EXPECT_EQ(log.lines, Lines{where() + "nothing has been recorded yet"});

  store_->BHClientSetValueForScalarKey("k", 1);
  store_->BHClientSetValueForScalarKey("k", 2);
  clock.time = plist::Date::since1970((kToday + 1) * 86400.0);
  store_->BHClientSetValueForScalarKey("k", 3);
  const auto reader = open();
  EXPECT_EQ(scalars(*reader->initWithDefaultPath(), "", kSmallest, kLargest), Rows{});

  // An active reader keeps the log from being emptied, but not values from being kept.
  set({{"other", kToday, 9}});
  log.lines.clear();
  const auto impatient = open(1);
  impatient->BHClientSetValueForScalarKey("late", 4);
  reader->initWithDefaultPath()->scalarsForKeyPrefix(
      "other", kToday - 1, kToday,
      [&](auto, auto, auto, auto&) { impatient->BHClientCheckpoint(); });
  EXPECT_EQ(log.lines, Lines{where() + "other processes still use the write-ahead log: what they "
                                       "need stays there until the next checkpoint"});

  const auto idle = reader->initWithDefaultPath();
  store_->BHClientCheckpoint();
  EXPECT_FALSE(logHoldsPages(store_->path()));
  const std::int32_t tomorrow = kToday + 1;
  EXPECT_EQ(
      scalars(*idle, "", kSmallest, kLargest),
      (Rows{{"k", kToday, 2}, {"k", tomorrow, 3}, {"late", tomorrow, 4}, {"other", kToday, 9}}));
  store_->BHClientSetValueForScalarKey("end", 5);
  store_.reset();
  EXPECT_EQ(scalars(*idle, "end", kSmallest, kLargest), (Rows{{"end", tomorrow, 5}}));
  for (const auto& [time, day] : {std::pair(1e300, kLastDay), std::pair(-0.5, -1)}) {
    clock.time = plist::Date::since1970(time);
    EXPECT_EQ(open()->BHDaysSince1970(), day);
  }
}

TEST_F(StoreTest, AnEmptiedLogKeepsItsFileAndWhatItHeldIsPast) {
  const std::string file = store_->path() + "-wal";
  {
    auto batch = store_->beginBatch();
    const std::vector<DistributionSample> samples(200'000, {1.5, 0});
    EXPECT_TRUE((*batch)->appendValues(kToday, "many", samples));
    EXPECT_TRUE((*batch)->setScalar(kToday, "k", 1));
    EXPECT_TRUE((*batch)->commit());
  }
  EXPECT_FALSE(logHoldsPages(store_->path()));
  EXPECT_EQ(std::filesystem::file_size(file), kKeptLogBytes);
  set({{"k", kToday, 2}});
  EXPECT_TRUE(logHoldsPages(store_->path()));
  // The state after a power cut.
  std::filesystem::remove(store_->path() + "-shm");
  EXPECT_EQ(scalarsOfToday(), (Rows{{"k", kToday, 2}}));
  store_->BHClientCheckpoint();
  EXPECT_FALSE(logHoldsPages(store_->path()));
  EXPECT_EQ(std::filesystem::file_size(file), kKeptLogBytes);
  EXPECT_EQ(scalarsOfToday(), (Rows{{"k", kToday, 2}}));
}

TEST_F(StoreTest, ValuesOutlastALock) {
  set({{"k", kToday, 1}});
  log.lines.clear();
  const auto impatient = open(1);
  impatient->BHClientSetValueForScalarKey("k", 2);
  auto writer = store_->beginBatch();
  EXPECT_TRUE((*writer)->setScalar(kToday, "other", 1));
  EXPECT_TRUE(impatient->commit()) << "rows that wait in memory hold nobody up";
  impatient->BHClientSetValueForScalarKey("k", 3);
  EXPECT_TRUE((*writer)->addScalar(kToday, "other", 1));
  EXPECT_TRUE(impatient->commit()) << "kept beside the store";
  EXPECT_EQ(log.lines, Lines{where() + "database is locked: try again when the process that holds "
                                       "it has finished; 1 value waits for the next commit"});
  EXPECT_EQ(scalarsOfToday(), (Rows{{"k", kToday, 2}})) << "readers do not wait for writers";
  writer->reset();
  EXPECT_TRUE(impatient->commit());
  EXPECT_EQ(scalarsOfToday(), (Rows{{"k", kToday, 3}}));

  // The waiting time is spent only once, whatever is waited for.
  const auto budget = std::make_shared<BusyBudget>(20);
  const auto another = std::make_shared<BusyBudget>(20);
  const StoreFolderLock held(store_->path(), *another);
  EXPECT_THROW(StoreFolderLock(store_->path(), *budget), StoreFailure);
  EXPECT_FALSE(budget->wait());
  SqliteConnection first = openStoreForWriting(store_->path(), another);
  SqliteConnection second = openStoreForWriting(store_->path(), another);
  first.execute("BEGIN IMMEDIATE");
  EXPECT_THROW(second.execute("BEGIN IMMEDIATE"), StoreFailure);
  EXPECT_FALSE(another->wait());
}

TEST_F(StoreTest, ReadsWhereNothingCanBeWritten) {
  if (geteuid() != 0) GTEST_SKIP() << "only root can become another user";
  set({{"k", kToday, 1}});
  const std::string folder = std::filesystem::path(store_->path()).parent_path();
  const std::string rootFolder = root.path("");
  ASSERT_EQ(chmod(rootFolder.c_str(), 0755), 0);
  // Compares the output of a process that is restricted in some way.
  const auto restricted = [](auto restriction, const std::string& expected, auto action) {
    const auto compare = [&] { return !restriction() ? 2 : action() == expected ? 0 : 1; };
    EXPECT_EQ(inChild(compare), 0) << expected;
  };
  // A user who owns nothing here.
  const auto asAnother = [&](const std::string& expected, const auto& action) {
    const auto become = [] { return setresuid(65534, 65534, 65534) == 0; };
    restricted(become, expected, action);
  };
  const auto readAll = [&] {
    std::string text;
    for (const Row& row : scalarsOfToday())
      text += row.key + "=" + std::to_string(row.value) + ";";
    for (const std::string& line : log.lines)
      text += line + "\n";
    return text;
  };
  const auto writeAndTell = [&] {
    store_->BHClientSetValueForScalarKey("k", 3);
    store_->commit();
    store_->commit();
    return log.lines.size() == 1 ? log.lines[0] : std::to_string(log.lines.size()) + " lines";
  };
  const std::string advice =
      " (Permission denied): check owner and permissions of the file and its folder";
  const std::string waits = "; 1 value is not kept yet: cannot write " + store_->path() + "-kept: ";
  const std::string denied = "Permission denied; run as root or as the owner of the files";
  // No room for a single further byte.
  const auto full = [] {
    const rlimit none{0, 0};
    return signal(SIGXFSZ, SIG_IGN) != SIG_ERR && setrlimit(RLIMIT_FSIZE, &none) == 0;
  };
  restricted(full, "k=1;", readAll);
  restricted(
      full,
      where() + "disk I/O error: check the file system that holds it" + waits + "File too large",
      writeAndTell);
  // The log stays there with its index, which can be read where it cannot be written.
  const auto letOthersRead = [&] {
    for (const char* ending : {"", "-wal", "-shm"})
      EXPECT_EQ(chmod((store_->path() + ending).c_str(), 0644), 0);
  };
  letOthersRead();
  asAnother("k=1;", readAll);
  // The only writer leaves an empty index.
  const std::string index = store_->path() + "-shm";
  std::filesystem::remove(index);
  store_->BHClientSetValueForScalarKey("k", 1);
  EXPECT_TRUE(store_->commit());
  EXPECT_EQ(std::filesystem::file_size(index), 0U);
  EXPECT_EQ(FileSystem::status(index)->st_mode & 0777U, 0640U);
  letOthersRead();
  asAnother("k=1;", readAll);
  settle();
  ASSERT_EQ(chmod(store_->path().c_str(), 0444), 0);
  ASSERT_EQ(chmod(folder.c_str(), 0555), 0);
  asAnother("k=1;", readAll);
  asAnother(where() + "attempt to write a readonly database" + advice +
                "; 1 value is not kept yet: cannot lock " + folder + "/.lock: " + denied,
            writeAndTell);
  ASSERT_EQ(chmod(folder.c_str(), 0755), 0);
  write(std::string(kStorePath) + "-wal", "left behind");
  ASSERT_EQ(chmod(folder.c_str(), 0555), 0);
  asAnother(where() + "unable to open database file" + advice +
                "; its write-ahead log is only readable where the folder can be written: have a "
                "user who may write run 'tavrelctl stat list' once\n",
            readAll);

  // While a writer has the log open, its index is there for readers.
  ASSERT_EQ(chmod(folder.c_str(), 0755), 0);
  ASSERT_EQ(chmod(store_->path().c_str(), 0644), 0);
  std::filesystem::remove(store_->path() + "-wal");
  {
    const auto reader = store_->initWithDefaultPath();
    EXPECT_EQ(scalars(*reader, "", kToday - 1, kToday).size(), 1U);
    set({{"k", kToday, 2}});
    for (const char* ending : {"", "-wal", "-shm"}) {
      const std::string file = store_->path() + ending;
      EXPECT_EQ(FileSystem::status(file)->st_mode & 0777U, 0640U) << file;
    }
    letOthersRead();
    asAnother("k=2;", readAll);
  }
  ASSERT_EQ(chmod(store_->path().c_str(), 0600), 0);
  asAnother(where() + "unable to open database file" + advice + "\n", readAll);
}

TEST_F(StoreTest, ReadersThatChangeNothingLeaveNoTraceAndSayWhenWritersInterfered) {
  set({{"a", kToday, 1}, {"b", kToday, 2}});
  settle();
  const auto fileCount = [&] {
    const auto folder = std::filesystem::path(store_->path()).parent_path();
    return std::ssize(*FileSystem().list(folder));
  };
  SqliteStore reader(root, clock, preferences, log, 10'000, true);
  int rows = 0;
  const auto walk = [&](bool writesMeanwhile, std::ptrdiff_t filesMeanwhile) {
    rows = 0;
    return (*reader.openHistory())->walkScalars("", kToday, kToday, [&](auto, auto, auto, auto&) {
      ++rows;
      if (writesMeanwhile) {
        set({{"c", kToday, rows}});
        store_->BHClientCheckpoint();
      }
      EXPECT_EQ(fileCount(), filesMeanwhile);
    });
  };
  EXPECT_TRUE(walk(false, 1));
  EXPECT_EQ(rows, 2);
  EXPECT_EQ(walk(true, 3).error().message,
            where() + "was written while it was read: run the command again");
  const auto keepsTheLog = store_->openHistory();
  ASSERT_TRUE((*keepsTheLog)->daysHeld());
  set({{"d", kToday, 4}});
  EXPECT_TRUE(walk(false, 3));
  EXPECT_EQ(rows, 4) << "what still stands in the log is read";
}

TEST_F(StoreTest, AKillWhileItIsMadeLeavesAStoreOrNone) {
  std::size_t calls = 0;
  while (runUntilSystemCall(calls, [&] { set({{"k", kToday, 1}}); })) {
    SCOPED_TRACE(++calls);
    store_ = open();
    const Rows kept = scalarsOfToday();
    EXPECT_TRUE(kept.empty() || kept == (Rows{{"k", kToday, 1}}));
    set({{"l", kToday, 2}});
    EXPECT_EQ(scalarsOfToday().size(), kept.size() + 1);
    EXPECT_EQ(corruptions(), 0);
    std::filesystem::remove_all(std::filesystem::path(store_->path()).parent_path());
    store_ = open();
  }
  EXPECT_GT(calls, 50U);
}

}  // namespace
}  // namespace tavrel
