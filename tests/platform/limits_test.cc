// Limits on what a device holds, and what is removed when they are exceeded.

#include <cstring>
#include <numeric>
#include <sys/file.h>

#include "faulty_file_system.h"
#include "platform/linux/limits/tidy.h"
#include "platform/persisted_state.h"
#include "store_fixture.h"

namespace tavrel {
namespace {

constexpr const char* kPending = "/var/mobile/Library/Logs/Submission/pending/";

using Days = std::vector<std::int32_t>;
using plist::Dictionary;

class LimitsTest : public StoreTest {
 protected:
  void limit(const Dictionary& content) {
    write("/etc/tavrel/limits.plist", *coding.encodeXml(content));
  }
  TidyReport tidy() { return Tidy(root, files, coding, preferences, store).run(); }

  /// Records a scalar, and a distribution with `values` values, on each day.
  void record(const Days& days, std::size_t values = 5) {
    auto batch = store.beginBatch();
    ASSERT_TRUE(batch) << batch.error().message;
    for (const std::int32_t day : days) {
      ASSERT_TRUE((*batch)->setScalar(day, "com.example.s", day));
      const std::vector<DistributionSample> samples(values, {1.5, 7});
      ASSERT_TRUE((*batch)->appendValues(day, "com.example.d", samples));
    }
    ASSERT_TRUE((*batch)->commit());
  }
  Days daysHeld() { return *(*store.openHistory())->days(); }
  static Days range(std::int32_t first, std::int32_t last) {
    Days days(static_cast<std::size_t>(last - first + 1));
    std::iota(days.begin(), days.end(), first);
    return days;
  }
  void setLastRun(const plist::Value& day) {
    preferences.ZTXPreferencesSetValue(kLastRunDayKey, day, kTavrelDomain);
  }
  std::int64_t statistic(std::string_view key) {
    std::int64_t found = -1;
    EXPECT_TRUE((*store.openHistory())
                    ->walkScalar(key, kToday, kToday,
                                 [&](auto, auto, std::int64_t value, bool&) { found = value; }));
    return found;
  }

  SqliteStore& store = *store_;
};

TEST_F(LimitsTest, NamesTheFirstFaultOfTheFileAndRemovesNothing) {
  record(range(kToday - 200, kToday));
  const auto one = [](const char* kind, const char* name, const plist::Value& value) {
    return Dictionary{{kind, Dictionary{{name, value}}}};
  };
  const std::pair<plist::Value, const char*> kCases[] = {
      {Dictionary{{"Stores", Dictionary::create()}},
       "\"Stores\" is not a limit; they are Store, Pending, Outbox, Withheld, Refused, Records, "
       "EccEvents, SetAside"},
      {Dictionary{{"Store", 5}}, "Store must be a dictionary"},
      {one("Store", "Day", 5), "Store has no limit \"Day\"; it has Days and Bytes"},
      {one("SetAside", "Days", 5), "SetAside has no limit \"Days\"; it has Bytes"},
      {one("Store", "Days", 0), "Store/Days must be an integer from 1 to 36500"},
      {one("Store", "Days", 2.5), "Store/Days must be an integer from 1 to 36500"},
      {one("Outbox", "Bytes", 65535),
       "Outbox/Bytes must be an integer from 65536 to 1099511627776"},
      {plist::Array{1}, "it is not a dictionary"}};
  const std::string path = root.path("/etc/tavrel/limits.plist");
  const auto expectFault = [&](std::string fault) {
    fault = path + ": " + fault + ": nothing is removed until it is repaired";
    EXPECT_EQ(tidy().failures, Lines{fault});
    EXPECT_EQ(contentOf(root.path(kTidyFailuresFile)), fault + "\n");
  };
  for (const auto& [content, fault] : kCases) {
    write("/etc/tavrel/limits.plist", *coding.encodeXml(content));
    expectFault(fault);
  }
  std::filesystem::remove(path);
  std::filesystem::create_symlink("nowhere", path);
  expectFault("it is a link that leads nowhere");
  std::filesystem::remove_all(root.path("/etc/tavrel"));
  std::filesystem::create_symlink("nowhere", root.path("/etc/tavrel"));
  expectFault("its folder is a link that leads nowhere, or a file");
  std::filesystem::remove(root.path("/etc/tavrel"));
  limit({{"Store", Dictionary{{"Days", 36'500}}}});
  EXPECT_EQ(tidy().failures, Lines{});
  EXPECT_FALSE(std::filesystem::exists(root.path(kTidyFailuresFile)));
  std::filesystem::permissions(path, std::filesystem::perms(0620));
  expectFault("users other than root may write it: make root its owner and set mode 0644");
  EXPECT_EQ(daysHeld().size(), 201U);
}

TEST_F(LimitsTest, RemovesTheOldestDaysAndThoseAfterTomorrowFirst) {
  limit({{"Store", Dictionary{{"Days", 3}}}});
  constexpr std::int32_t k1970 = -kToday;
  const struct {
    const char* what;
    std::int32_t today;  // this and all other days count from kToday
    std::optional<std::int32_t> lastRun;
    Days held, left;
  } kCases[] = {
      {"the oldest go", 0, -1, range(-9, 0), range(-2, 0)},
      {"yesterday waits for its run", 0, -2, {-9, -1, 0, k1970 + 5, k1970 + 6}, {-9, -1, 0}},
      {"days of a clock that was ahead go first", 0, -1, {-3, -2, -1, 0, 2, 3650}, {-2, -1, 0}},
      {"tomorrow counts as today's neighbour", 0, -2, {-1, 0, 1, -7}, range(-1, 1)},
      {"a jump ahead costs one day a day", 3650, 3649, {-2, -1, 0, 3650}, {-1, 0, 3650}},
      {"in 1970 the next run's day stays",
       k1970 + 5,
       -3,
       {k1970 + 2, k1970 + 5, -2, -1},
       {k1970 + 5, -2, -1}},
      {"nothing is due", 0, std::nullopt, {-3000, 0}, {-3000, 0}}};
  const auto dated = [](Days days) {
    for (std::int32_t& day : days)
      day += kToday;
    return days;
  };
  for (const auto& each : kCases) {
    SCOPED_TRACE(each.what);
    std::filesystem::remove_all(root.path("/var/mobile/Library/Brimhold"));
    record(dated(each.held));
    clock.time = plist::Date::since1970((kToday + each.today) * 86400.0 + 5);
    setLastRun(each.lastRun ? plist::Value(kToday + *each.lastRun) : plist::Value());
    EXPECT_EQ(tidy().failures, Lines{});
    EXPECT_EQ(daysHeld(), dated(each.left));  // the count of removed items is dated today
  }
}

TEST_F(LimitsTest, GivesSpaceBackAndCountsWhatWent) {
  setLastRun(kToday - 1);
  record(range(kToday - 99, kToday), 3000);
  // The state that a killed erasure leaves.
  sql("CREATE TABLE erased (zeros BLOB); INSERT INTO erased VALUES (zeroblob(999999))");
  ASSERT_EQ(sql("PRAGMA auto_vacuum"), Lines{"2"});
  limit({{"Store", Dictionary{{"Bytes", 1 << 20}}}});
  const TidyReport report = tidy();
  EXPECT_EQ(report.failures, Lines{});
  const Days left = daysHeld();
  EXPECT_EQ(left.back(), kToday);
  EXPECT_EQ(report.kinds[0].removed, 100 - static_cast<std::int64_t>(left.size()));
  EXPECT_EQ(statistic("com.norvane.tavrel.limits.store.days"), report.kinds[0].removed);
  EXPECT_EQ(statistic("com.norvane.tavrel.limits.store.early_days"), report.kinds[0].removed - 10);
  EXPECT_GT(left.size(), 20U) << "no more than necessary";
  EXPECT_LE(fs::file_size(store.path()), (1U << 20) + (1U << 17) + 8192);
  EXPECT_NE(sql("PRAGMA freelist_count"), Lines{"0"}) << "what the next days need stays";
  // What remains is intact.
  EXPECT_EQ(sql("PRAGMA integrity_check"), Lines{"ok"});
  EXPECT_EQ(sql("SELECT count(*) FROM chunks"), Lines{std::to_string(left.size() * 6)});
  // Positions of segments belong to no day.
  sql("INSERT INTO segments VALUES (7, x'00', zeroblob(999999))");
  EXPECT_EQ(tidy().kinds[0].removed, 0);
  limit({{"Store", Dictionary{{"Days", 1}}}});
  tidy();
  EXPECT_EQ(daysHeld(), Days{kToday});
  EXPECT_EQ(statistic("com.norvane.tavrel.limits.store.days"), 99);
  EXPECT_EQ(statistic("com.norvane.tavrel.limits.store.early_days"), report.kinds[0].removed - 10);
}

TEST_F(LimitsTest, KeepsDaysThatWaitWhateverTheirSize) {
  record({kToday - 1, kToday}, 20'000);
  limit({{"Store", Dictionary{{"Days", 1}, {"Bytes", 65536}}}});
  EXPECT_FALSE(tidy().kinds[0].exceeds) << "the run of yesterday frees that day";
  EXPECT_EQ(daysHeld(), (Days{kToday - 1, kToday}));
  setLastRun(kToday - 1);
  EXPECT_TRUE(tidy().kinds[0].exceeds);
  EXPECT_EQ(daysHeld(), Days{kToday});
}

TEST_F(LimitsTest, ConvertsAStoreThatCannotShrinkOnce) {
  setLastRun(kToday - 1);
  record(range(kToday - 30, kToday), 3000);
  sql("PRAGMA auto_vacuum = NONE; VACUUM");
  sql("PRAGMA application_id = 77");
  const auto before = fs::file_size(store.path());
  limit({{"Store", Dictionary{{"Days", 4}}}});
  EXPECT_EQ(tidy().failures, Lines{});
  EXPECT_EQ(sql("PRAGMA auto_vacuum"), Lines{"2"});
  EXPECT_LT(fs::file_size(store.path()), before / 5);
  EXPECT_EQ(sql("PRAGMA application_id"), Lines{"77"});
  EXPECT_EQ(daysHeld(), range(kToday - 3, kToday));
}

TEST_F(LimitsTest, RemovesADayOfRunsThatDoNotFitOneStep) {
  setLastRun(kToday - 1);
  limit({{"Store", Dictionary{{"Days", 1}}}});
  for (int commits = 0; commits < 3; ++commits)
    record({kToday - 2}, 400'000);
  record({kToday});
  // A row that contradicts itself is removed alone: its runs may belong to another row.
  sql("UPDATE distributions SET count = count + 1 WHERE day = " + std::to_string(kToday));
  EXPECT_EQ(tidy().failures, Lines{});
  EXPECT_EQ(daysHeld(), Days{kToday});
  EXPECT_EQ(sql("SELECT count(*) FROM chunks"), Lines{"2"});
}

TEST_F(LimitsTest, RunsThatContradictThemselvesTakeNothingOfOthers) {
  setLastRun(kToday - 1);
  limit({{"Store", Dictionary{{"Days", 1}}}});
  // The first chunk, twice the chunks, the values: 33 chunks of 3, 2^61 of one, none of 3.
  for (const char* runs : {"004203", "0080808080808080804001", "000003"}) {
    for (const bool erases : {false, true}) {
      SCOPED_TRACE(runs);
      std::filesystem::remove_all(root.path("/var/mobile/Library/Brimhold"));
      const std::string count(1, runs[std::strlen(runs) - 1]);
      record({kToday - 2, kToday}, static_cast<std::size_t>(count[0] - '0'));
      sql("UPDATE distributions SET runs = x'" + std::string(runs) +
          "' WHERE day = " + std::to_string(kToday - 2));
      if (erases) {
        const auto erased = store.erase({"com.example.d", kToday - 2, kToday - 2});
        ASSERT_TRUE(erased) << erased.error().message;
        EXPECT_EQ(erased->damaged, 1U);
      } else {
        EXPECT_EQ(tidy().failures, Lines{});
      }
      EXPECT_EQ(sql("SELECT count FROM distributions"), Lines{count});
      EXPECT_EQ(sql("SELECT count(*) FROM chunks"), Lines{"4"});
    }
  }
}

TEST_F(LimitsTest, OtherDaysGoInsteadOfThoseThatCannotBeRead) {
  setLastRun(kToday - 1);
  limit({{"Store", Dictionary{{"Days", 3}}}});
  // The page in which a search for the first day ends, and one that only its removal reads.
  for (const char* page : {"/000/", "/001/"}) {
    SCOPED_TRACE(page);
    std::filesystem::remove_all(root.path("/var/mobile/Library/Brimhold"));
    Rows rows;
    for (int i = 0; i < 600; ++i)
      rows.push_back({format("com.example.%03d", i), kToday - 9, i});
    set(rows);
    record(range(kToday - 9, kToday));
    settle();
    const off_t end =
        4096 *
        std::stol(
            sql(format("SELECT pageno FROM dbstat WHERE name = 'scalars' AND path = '%s'", page))
                .at(0));
    {
      const FailingReads reads(end - 4096, end);
      EXPECT_EQ(tidy().failures,
                Lines{where() + "the file cannot be read (Input/output error): check the file "
                                "system that holds it"});
    }
    EXPECT_EQ(daysHeld(), (Days{kToday - 9, kToday - 1, kToday}));
  }
}

TEST_F(LimitsTest, RowsOutOfOrderReplaceTheStore) {
  setLastRun(kToday - 1);
  limit({{"Store", Dictionary{{"Days", 1}}}});
  const std::string reason = where() + "its rows are not in the order of their keys";
  for (const bool areScalars : {true, false}) {
    auto batch = store.beginBatch();
    for (int i = 0; i < (areScalars ? 5000 : 5); ++i) {
      const std::string key = format("com.example.%04d", i);
      ASSERT_TRUE(areScalars ? (*batch)->setScalar(kToday - 2, key, i)
                             : (*batch)->appendValue(kToday - 2, key, 1, i));
    }
    ASSERT_TRUE((*batch)->setScalar(kToday, "com.example.today", 1));
    ASSERT_TRUE((*batch)->commit());
    sql("PRAGMA wal_checkpoint(TRUNCATE)");
    const std::string sound = contentOf(store.path());
    std::string first = sound;
    first.at(first.find("com.example.0000") + 12) ^= 8;  // the first key of the day
    // A key that no longer has the prefix keeps others with it from being found.
    std::string other = sound;
    other.at(other.find("com.example.0003")) ^= 8;
    std::ofstream(store.path()) << first;
    log.lines.clear();
    setLastRun(kToday - 2);
    tidy();
    EXPECT_EQ(log.lines, Lines{}) << "yesterday is still to be reported";
    setLastRun(kToday - 1);
    EXPECT_EQ(tidy().failures,
              Lines{"statistics store: it was damaged and is set aside, with all its days"});
    ASSERT_EQ(log.lines.size(), 1U);
    EXPECT_TRUE(log.lines[0].starts_with(reason) &&
                log.lines[0].find("; it is now ") != std::string::npos)
        << log.lines[0];
    for (const std::string& content : {first, other}) {
      std::ofstream(store.path()) << content;
      const auto erased = store.erase({.prefix = "com.example."});
      ASSERT_FALSE(erased);
      EXPECT_EQ(erased.error().message, where() +
                                            "it was damaged and is set aside with what was to be "
                                            "erased: remove that file");
      EXPECT_EQ(store.erase({.prefix = "com.example."})->scalars, 0U);
    }
  }
}

TEST_F(LimitsTest, RemovesFilesFromTheOldestOn) {
  const auto fileLog = [&](const std::string& name, std::size_t bytes) {
    write(kPending + name + ".log", std::string(bytes, 'L'));
    write(kPending + name + ".metadata.plist", "M");
  };
  fileLog("log-tallied-20261127T000000Z-00000001", 40'000);
  fileLog("log-tallied-20261126T000000Z-00000002", 40'000);
  fileLog("StorageStatus-20261125T000000Z-00000003", 40'000);
  fileLog("log-tallied-20361127T000000Z-00000004", 40'000);
  write(std::string(kPending) + "other.txt", std::string(99'999, 'x'));
  const std::string records = "/var/mobile/Library/Logs/CrashReporter/StructuredData/";
  write(records + "176-2026-11-27.jsonl", std::string(90'000, 'r'));
  write(records + "176-2026-11-26.jsonl", std::string(70'000, 'r'));
  write(records + "176-2026-11-25.jsonl", "r");
  write("/var/lib/tavrel/ecc-events/b.event", std::string(60'000, 'e'));
  write("/var/lib/tavrel/ecc-events/a.event", std::string(60'000, 'e'));
  const std::string sqlite = "/var/mobile/Library/Brimhold/BHDataStore.sqlitedb";
  const auto setAside = [&](const std::string& name, int daysAgo) {
    write(name, std::string(70'000, 'c'));
    const timespec changed{(kToday - daysAgo) * kSecondsPerDay, 0};
    const timespec times[] = {changed, changed};
    utimensat(AT_FDCWD, root.path(name).c_str(), times, 0);
  };
  setAside(sqlite + "-kept-damaged", 2);
  setAside("/var/lib/tavrel/ecc-events/c.event.unusable", -2);
  setAside(sqlite + ".corrupt-20261126T180218Z", 5);
  write("/var/mobile/Library/Preferences/com.example.corrupt-x.plist", std::string(70'000, 'p'));
  const Dictionary small{{"Bytes", 65536}};
  limit({{"Pending", Dictionary{{"Bytes", 100'000}}},
         {"Records", small},
         {"EccEvents", small},
         {"SetAside", small}});
  const TidyReport report = tidy();
  EXPECT_EQ(report.failures, Lines{});
  std::vector<std::int64_t> removed;
  for (const TidiedKind& kind : report.kinds)
    removed.push_back(kind.removed);
  EXPECT_EQ(removed, (std::vector<std::int64_t>{0, 2, 0, 0, 0, 1, 1, 2}));
  EXPECT_EQ(*files.list(root.path(kPending)),
            (Lines{"log-tallied-20261126T000000Z-00000002.log",
                   "log-tallied-20261126T000000Z-00000002.metadata.plist",
                   "log-tallied-20261127T000000Z-00000001.log",
                   "log-tallied-20261127T000000Z-00000001.metadata.plist", "other.txt"}));
  EXPECT_EQ(*files.list(root.path(records)),
            (Lines{"176-2026-11-25.jsonl", "176-2026-11-27.jsonl"}));
  EXPECT_EQ(*files.list(root.path("/var/lib/tavrel/ecc-events")), Lines{"b.event"});
  EXPECT_EQ(statistic("com.norvane.tavrel.limits.pending.logs"), 2);
  EXPECT_EQ(statistic("com.norvane.tavrel.limits.records.files"), 1);

  // The newest log stays, however small the limit, and others do not go instead of one that exceeds
  // it alone; the limit of days works like that of bytes.
  fileLog("log-tallied-20261127T000009Z-00000005", 400'000);
  fileLog("log-tallied-20261127T000001Z-00000007", 70'000);
  fileLog("StorageStatus-20261126T000009Z-00000006", 1);
  limit({{"Pending", Dictionary{{"Days", 1}}}});
  EXPECT_EQ(tidy().kinds[1].removed, 2);
  limit({{"Pending", small}});
  EXPECT_EQ(tidy().kinds[1].removed, 1);
  EXPECT_FALSE(fs::exists(root.path(kPending) + "log-tallied-20261127T000001Z-00000007.log"));
  EXPECT_EQ(files.list(root.path(kPending))->size(), 5U);
}

TEST_F(LimitsTest, GoesOnWhenAFileStaysAndHoldsTheLock) {
  struct Stuck : FileSystem {
    explicit Stuck(const std::string& path) : lock(path) {}
    int removeFile(const char* path) override {
      const Descriptor other(::open(lock.c_str(), O_RDONLY));
      isLocked = isLocked && other && flock(other.get(), LOCK_EX | LOCK_NB) != 0;
      const std::string log = path;
      if (const auto day = log.find("20261125"); day != log.npos) {
        fs::remove(std::string(log).replace(day, 8, "20261126"));  // the uploader has sent it
      }
      if (log.find("20261124") == log.npos) return FileSystem::removeFile(path);
      errno = EPERM;
      return -1;
    }
    std::string lock;
    bool isLocked = true;
  } stuck(root.path("/var/mobile/Library/Logs/Submission/.lock"));
  for (int day = 24; day <= 27; ++day)
    write(format("%sS-202611%dT000000Z-00000000.log", kPending, day),
          std::string(day == 24 ? 70'000 : 1, 'L'));
  limit({{"Pending", Dictionary{{"Days", 2}, {"Bytes", 65'536}}}});
  const TidyReport report = Tidy(root, stuck, coding, preferences, store).run();
  EXPECT_EQ(report.failures,
            Lines{"cannot remove " + root.path(kPending) +
                  "S-20261124T000000Z-00000000.log: Operation not permitted" +
                  (geteuid() == 0 ? "" : "; run as root or as the owner of the files")});
  EXPECT_EQ(report.kinds[1].removed, 1);
  EXPECT_EQ(*files.list(root.path(kPending)),
            (Lines{"S-20261124T000000Z-00000000.log", "S-20261127T000000Z-00000000.log"}));
  EXPECT_TRUE(stuck.isLocked);
}

TEST(LimitsFaults, LogsHaveTheirMetadataAfterEveryFault) {
  const auto prepare = [](const TemporaryRoot& device) {
    for (int log = 1; log <= 4; ++log) {
      const std::string name = format("%slog-tallied-2026112%dT000000Z-00000000", kPending, log);
      device.write(name + ".log", "L");
      device.write(name + ".metadata.plist", "M");
    }
  };
  strikeEachCall(prepare, [](const TemporaryRoot& device, FaultyFileSystem& faulty) {
    auto kept = KeptFiles::list(Kept::Pending, device.root, faulty, kToday);
    ASSERT_TRUE(kept);
    kept->trim({2, 1 << 20});
    faulty.settle();

    QuickFileSystem files;
    const auto names = *files.list(device.root.path(kPending));
    std::size_t logs = 0;
    for (const std::string& name : names) {
      if (!name.ends_with(".log")) continue;
      ++logs;
      EXPECT_TRUE(
          std::ranges::binary_search(names, name.substr(0, name.size() - 4) + ".metadata.plist"))
          << name;
    }
    EXPECT_GE(logs, 2U);
    auto later = KeptFiles::list(Kept::Pending, device.root, files, kToday);
    later->trim({2, 1 << 20});
    EXPECT_EQ(files.list(device.root.path(kPending))->size(), 4U);
  });
}

}  // namespace
}  // namespace tavrel
