#include <set>

#include "platform/linux/store/kept_values.h"
#include "platform/store_path.h"
#include "store_fixture.h"

namespace tavrel {
namespace {

TEST_F(StoreTest, ValuesThatCannotBeReadFailTheirKeyAlone) {
  auto batch = store_->beginBatch();
  ASSERT_TRUE((*batch)->appendValue(kToday, "bad\n", 1, 1));
  ASSERT_TRUE((*batch)->appendValue(kToday, "good", 2, 2));
  ASSERT_TRUE((*batch)->commit());
  batch->reset();
  settle();
  const std::string whole = contentOf(store_->path());
  const std::string ofBad = " WHERE key = CAST('bad' || char(10) AS BLOB)";
  const auto miscounts = [](int count) {
    return format("it does not hold the %d values that it counts", count);
  };
  const std::string misformed = "its values are not in the form that this program writes";
  const std::string misled = "it refers to values that cannot exist";
  // Whether a writer may append: it reads the row but not the chunks.
  const std::tuple<std::string, std::string, bool> cases[] = {
      {"UPDATE chunks SET data = x'00' WHERE chunk = 0", misformed, true},
      {"DELETE FROM chunks WHERE chunk = 0", miscounts(1), true},
      {"UPDATE chunks SET data = zeroblob(16) WHERE chunk = 0", miscounts(1), true},
      {"DELETE FROM chunks WHERE chunk = 1", miscounts(1), true},
      {"UPDATE chunks SET data = x'00' WHERE chunk = 1", misformed, true},
      {"UPDATE distributions SET count = 2" + ofBad, miscounts(2), false},
      {"UPDATE distributions SET count = 0, runs = x''" + ofBad, miscounts(0), false},
      {"UPDATE distributions SET count = -1" + ofBad, miscounts(-1), false},
      {"UPDATE distributions SET runs = x'000180'" + ofBad, misled, false},
      {"UPDATE distributions SET runs = x'FEFFFFFFFFFFFFFF7F0201'" + ofBad, misled, false},
      {"UPDATE chunks SET data = zeroblob(8 * 1025) WHERE chunk = 0", misformed, true}};
  const auto lineAbout = [&](const std::string& reason) {
    return where() + "distribution \"bad\\n\" of day 20784: " + reason +
           ": restore the file from a copy or move it away";
  };
  for (const auto& [change, reason, takesMore] : cases) {
    SCOPED_TRACE(change);
    settle();
    write(kStorePath, whole);
    sql(change);
    log.lines.clear();
    const auto history = store_->openHistory();
    Lines seen;
    const auto see = [&](std::string_view key, BHHistoryDistributionEnumerator& values) {
      const auto size = take(values).size();
      seen.push_back(std::string(key) + std::to_string(size) + (values.failed() ? " failed" : ""));
    };
    const auto walk = [&](std::string_view unread) {
      const auto handler = [&](auto key, auto, auto, auto& values, auto&) {
        if (key != unread) see(key, values);
      };
      return (*history)->walkDistributions("", kFirstDay, kLastDay, handler);
    };
    EXPECT_TRUE(walk("bad\n"));
    EXPECT_EQ(walk("").error().message, lineAbout(reason));
    EXPECT_FALSE((*history)->distributionsForKeyPrefix(
        "", kToday - 1, kToday, [&](auto key, auto, auto& values, auto&) { see(key, values); }));
    const std::string bad = "bad\n0 failed";
    EXPECT_EQ(seen, (Lines{"good1", bad, "good1", bad, "good1"}));
    EXPECT_EQ(log.lines, Lines{lineAbout(reason)});
    batch = store_->beginBatch();
    ASSERT_TRUE((*batch)->appendValue(kToday, "bad\n", 3, 3));
    EXPECT_EQ(static_cast<bool>((*batch)->commit()), takesMore);
    batch->reset();
  }
  settle();
  write(kStorePath, whole);
  sql("UPDATE distributions SET count = 2, runs = x'000202'" + ofBad);
  const auto drop = [](auto, auto, auto, auto& values, auto&) { take(values); };
  EXPECT_EQ((*store_->openHistory())
                ->walkDistribution("bad\n", kFirstDay, kLastDay, drop)
                .error()
                .message,
            lineAbout(miscounts(2)));
  sql("DELETE FROM chunks");
  const auto none = (*store_->openHistory())->walkDistributions("", kFirstDay, kLastDay, drop);
  EXPECT_TRUE(none.error().message.ends_with("; 1 more could not be read whole"));
  EXPECT_EQ(corruptions(), 0);
}

TEST_F(StoreTest, KeptValuesAreTakenInOnce) {
  const std::string kept = store_->path() + "-kept";
  set({{"k", kToday, 1}});
  const auto impatient = open(1);
  const auto keep = [&](const char* key, std::int64_t value, bool commits = false) {
    auto writer = store_->beginBatch();
    EXPECT_TRUE((*writer)->addScalar(kToday, "lock", 1));
    impatient->BHClientSetValueForScalarKey(key, value);
    EXPECT_TRUE(impatient->BHClientCheckpoint());
    EXPECT_TRUE(!commits || (*writer)->commit());
  };
  keep("k", 2);
  keep("j", 3);
  EXPECT_EQ(scalarsOfToday(), (Rows{{"k", kToday, 1}}));
  EXPECT_EQ(FileSystem::status(kept)->st_mode & 0777U, 0640U);
  const std::string content = contentOf(kept);
  set({{"k", kToday, 4}});
  EXPECT_EQ(scalarsOfToday(), (Rows{{"j", kToday, 3}, {"k", kToday, 4}}));
  EXPECT_FALSE(std::filesystem::exists(kept));

  // The state after a kill between commit and removal; more is kept before anybody notices.
  write(std::string(kStorePath) + "-kept", content);
  keep("j", 5);
  store_->BHClientCheckpoint();
  EXPECT_EQ(scalarsOfToday(), (Rows{{"j", kToday, 5}, {"k", kToday, 4}}));
  EXPECT_FALSE(std::filesystem::exists(kept));

  for (std::size_t i = 0; i < content.size(); i += 7) {
    std::string damaged = content;
    damaged[i] = static_cast<char>(damaged[i] ^ 1);
    write(std::string(kStorePath) + "-kept", i == 0 ? "cut" : damaged);
    store_->BHClientCheckpoint();
    EXPECT_EQ(log.lines.back(), "values kept in " + kept +
                                    " are lost: the file is damaged; it is now " + kept +
                                    "-damaged");
    EXPECT_FALSE(std::filesystem::exists(kept));
    EXPECT_EQ(scalarsOfToday(), (Rows{{"j", kToday, 5}, {"k", kToday, 4}}));
  }
  // An unreadable file is not replaced.
  std::filesystem::create_directory(kept);
  EXPECT_FALSE(KeptValues(store_->path()).add({{0, kToday, 1, "d"}}));
  EXPECT_TRUE(std::filesystem::is_directory(kept));
  std::filesystem::remove(kept);
  for (const char value : {'a', 'b', 'c'})
    keep(std::string(400'000, value).c_str(), 1);
  EXPECT_TRUE(log.says(kept + " is full: the 1 earliest values are dropped"));
  store_->BHClientCheckpoint();
  EXPECT_EQ(scalarsOfToday().size(), 4U);

  // Values kept between taking in earlier ones and the commit are not removed with those.
  keep("j", 6);
  keep("j", 7, true);
  EXPECT_TRUE(std::filesystem::exists(kept));
  store_->BHClientCheckpoint();
  EXPECT_EQ(scalarsOfToday().at(2).value, 7);
}

TEST_F(StoreTest, SetsAsideWhatSqliteFindsDamagedAndNothingElse) {
  set({{"old", kToday, 1}});
  for (int i = 0; i < 500; ++i)
    store_->BHClientSetValueForScalarKey("k" + std::to_string(i), i);
  store_->BHClientCheckpoint();
  settle();
  const std::string good = contentOf(store_->path());
  sql("CREATE TABLE more (x); PRAGMA user_version = 3");
  const std::string later = contentOf(store_->path());
  std::filesystem::remove(store_->path());
  sql("CREATE TABLE theirs (x)");
  const std::string foreign = contentOf(store_->path());

  std::string flipped = good.substr(0, 4096) + std::string(good.size() - 4096, 'x');
  const std::tuple<const char*, std::string, bool, const char*> cases[] = {
      {"empty", "", false, nullptr},
      {"good", good, false, nullptr},
      {"garbage", std::string(10'000, 'x'), true, "file is not a database"},
      {"two bytes", "SQ", true, "file is not a database"},
      {"half a page", good.substr(0, 300), true, "database disk image is malformed"},
      {"cut", good.substr(0, good.size() / 2), true, "database disk image is malformed"},
      {"flipped", flipped, true, "database disk image is malformed"},
      {"later", later, false,
       "has schema version 3, which this program does not know (it knows 1 and 2), and is left "
       "alone: "
       "update tavrel, or move the file away"},
      {"foreign", foreign, false,
       "holds the tables of another program and is left alone: move it away"}};
  for (const auto& [name, content, damaged, reason] : cases) {
    for (const bool byReader : {true, false}) {
      SCOPED_TRACE(std::string(name) + (byReader ? ", read" : ", written"));
      store_ = open();
      std::filesystem::remove_all(std::filesystem::path(store_->path()).parent_path());
      write(kStorePath, content);
      log.lines.clear();
      preferences.ZTXPreferencesSetValue("DatabaseCorruptionCount", {}, "com.norvane.tallied");

      const auto drop = [](auto, auto, auto, auto&) {};
      const auto hasAllRows = [&] {
        return store_->initWithDefaultPath()->scalarsForKeyPrefix("", 0, kToday, drop);
      };
      if (byReader) {
        EXPECT_EQ(hasAllRows(), !reason);
      } else {
        store_->BHClientSetValueForScalarKey("new", 1);
        store_->BHClientCheckpoint();
      }
      const std::string aside = store_->path() + ".corrupt-20261127T180218Z";
      EXPECT_EQ(setAsideFiles(), damaged ? Lines{aside} : Lines{});
      EXPECT_EQ(corruptions(), damaged ? 1 : 0);
      if (damaged) {
        ASSERT_EQ(log.lines.size(), byReader ? log.lines.size() : 1U);
        EXPECT_EQ(log.lines[0], where() + reason + ": the file has to be set aside; it is now " +
                                    aside + " and a new store begins: inspect or remove that file");
        EXPECT_EQ(contentOf(aside), content);
      } else if (reason) {
        scalarsOfToday();
        store_->BHClientCheckpoint();
        EXPECT_EQ(log.lines, Lines{where() + reason +
                                   (byReader ? "" : "; 1 value waits for the next commit")});
        EXPECT_EQ(contentOf(store_->path()), content);
      }
      if (!byReader) {
        if (damaged) store_ = open();
        EXPECT_EQ(hasAllRows(), !reason) << "which the checkpoint has found out";
      }
      EXPECT_TRUE(store_->commit()) << "or kept";
    }
  }
  // What was set while the store belonged to another program is still there for a store of our own.
  std::filesystem::remove(store_->path());
  EXPECT_TRUE(store_->commit());
  EXPECT_EQ(scalarsOfToday(), (Rows{{"new", kToday, 1}}));

  // A process that finds the damage second does not set the new store aside.
  const StoreSite site{store_->path(), std::make_shared<BusyBudget>(1), clock, preferences, log};
  EXPECT_FALSE(site.setAside(FileIdentity{1, 1}, {StoreFault::Damaged, "damaged"}));
  EXPECT_EQ(scalarsOfToday().size(), 1U);

  const std::string elsewhere = root.path("/elsewhere");
  std::ofstream(elsewhere).close();
  const auto link = [&](const char* path) { return symlink(elsewhere.c_str(), path); };
  const auto pipe = [](const char* path) { return mkfifo(path, 0600); };
  const auto folder = [](const char* path) { return mkdir(path, 0700); };
  const std::pair<std::function<int(const char*)>, const char*> kObstacles[] = {
      {link, "is a symbolic link"},
      {pipe, "is not a regular file"},
      {folder, "is not a regular file"}};
  for (const auto& [make, what] : kObstacles) {
    std::filesystem::remove(store_->path());
    ASSERT_EQ(make(store_->path().c_str()), 0);
    log.lines.clear();
    store_ = open();
    EXPECT_EQ(scalarsOfToday(), Rows{});
    store_->BHClientSetValueForScalarKey("k", 1);
    EXPECT_TRUE(store_->commit()) << "kept";
    EXPECT_EQ(log.lines, Lines{where() + what + ": move it away"});
  }
  EXPECT_EQ(contentOf(elsewhere), "");
}

TEST_F(StoreTest, ADamagedStoreLeavesDaysIncomplete) {
  constexpr std::int64_t kNone = kSmallest;
  constexpr const char* kUnset = "19700101T000012Z";
  const std::tuple<std::string, std::int64_t, std::int64_t> cases[] = {
      {"20261125T235959Z", kToday, kToday - 2},  // somebody has inspected it
      {"20261127T000000Z.1", kToday - 9, kToday},
      {"20261127T000000Z", kToday + 365, kToday},  // the clock was ahead at the last change
      {kUnset, 0, kNone},
      {kUnset, kToday - 1, kToday - 1},  // the clock was not set yet
      {"20991231T000000Z", kToday - 3, kToday - 3},
      {"20991231T000000Z", kToday + 1, kNone},  // it was ahead
      {"20261127T000000Z-wal", kToday, kNone}};
  set({{"k", kToday, 1}});
  for (const auto& [ending, changed, last] : cases) {
    SCOPED_TRACE(ending);
    const std::string aside = store_->path() + ".corrupt-" + ending;
    std::ofstream(aside).close();
    const timespec time{changed * 86'400, 0};
    const timespec times[] = {time, time};
    utimensat(AT_FDCWD, aside.c_str(), times, 0);
    store_ = open();
    log.lines.clear();
    const auto history = store_->initWithDefaultPath();
    const auto isWhole = [&](std::int64_t day) {
      return history->scalarsForKeyPrefix("", day - 1, day, [](auto, auto, auto, auto&) {}) &&
             history->distributionsForKeyPrefix("", day - 1, day, [](auto, auto, auto&, auto&) {});
    };
    EXPECT_TRUE(isWhole(last == kNone ? kSmallest + 1 : last + 1));
    EXPECT_EQ(log.lines, Lines{});
    if (last != kNone) {
      EXPECT_FALSE(isWhole(last) || isWhole(last - 100));
      EXPECT_EQ(log.lines, Lines{where() + "rows may be missing: they were in " + aside +
                                 ", which is damaged: inspect or remove that file"});
    }
    std::filesystem::remove(aside);
  }
}

TEST_F(StoreTest, SaysWhenMemoryIsMissing) {
  set({{"a", kToday, 1}});
  sqlite3_hard_heap_limit64(1);
  const auto batch = store_->beginBatch();
  sqlite3_hard_heap_limit64(0);
  ASSERT_FALSE(batch);
  EXPECT_EQ(batch.error().message, where() + "out of memory: free some memory");
}

TEST_F(StoreTest, AFailingReadIsNoDamage) {
  for (int i = 0; i < 3; ++i) {
    set({{"k" + std::to_string(i), kToday, i}});
    auto batch = store_->beginBatch();
    ASSERT_TRUE((*batch)->appendValue(kToday, "d", 1, i) && (*batch)->commit());
  }
  const auto readAll = [&] {
    const auto history = store_->initWithDefaultPath();
    std::size_t found = 0;
    const bool hasScalars = history->scalarsForKeyPrefix("k", kToday - 1, kToday,
                                                         [&](auto, auto, auto, auto&) { ++found; });
    const bool hasDistributions = history->distributionsForKeyPrefix(
        "", kToday - 1, kToday,
        [&](auto, auto, auto& values, auto&) { found += take(values).size(); });
    EXPECT_TRUE(found == 6 || !hasScalars || !hasDistributions) << found;
    EXPECT_TRUE((hasScalars && hasDistributions) || !log.lines.empty());
    return found;
  };
  std::set<std::string> said;
  for (const bool writes : {false, true}) {
    for (const bool andLater : {false, true}) {
      for (int at = 1, hasFailed = 1; hasFailed != 0; ++at) {
        SCOPED_TRACE(std::to_string(at) + (andLater ? "+" : "") + (writes ? ", written" : ""));
        log.lines.clear();
        {
          int reads = 0;
          const FailingReads failing(
              [&](off_t, std::size_t) { return ++reads == at || (andLater && reads > at); });
          store_ = open();
          if (writes) store_->BHClientSetValueForScalarKey("w", at);
          if (writes) store_->BHClientCheckpoint();
          const std::size_t found = writes ? 6 : readAll();
          EXPECT_TRUE(found == 6 || !log.lines.empty()) << found;
          hasFailed = reads >= at;
        }
        said.insert(log.lines.begin(), log.lines.end());
        EXPECT_EQ(setAsideFiles(), Lines{});
        store_->BHClientCheckpoint();
        EXPECT_EQ(readAll(), 6U);
        EXPECT_EQ(scalars(*store_->initWithDefaultPath(), "w", kToday - 1, kToday),
                  writes ? Rows({{"w", kToday, at}}) : Rows{});
      }
    }
  }
  EXPECT_EQ(corruptions(), 0);
  EXPECT_TRUE(said.contains(where() + "looked damaged, but a second look found it sound: check "
                                      "the file system that holds it, and the memory that is "
                                      "free"));
}

}  // namespace
}  // namespace tavrel
