// A device on which programs record and folds run.
#pragma once

#include <cstdlib>
#include <set>

#include "platform/linux/folding/recorded_history.h"
#include "platform/linux/folding/segment_fold.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/store/sqlite_schema.h"
#include "platform/linux/store/sqlite_store.h"
#include "platform/platform.h"
#include "recording.h"
#include "tests/devices/temporary_root.h"

namespace tavrel {

inline int fromEnvironment(const char* name, int otherwise) {
  const char* const text = std::getenv(name);  // set for long manual runs
  return text ? static_cast<int>(std::strtol(text, nullptr, 10)) : otherwise;
}

/// Folds into the device's store, and reads what it holds.
class FoldTest : public Recording {
 protected:
  FoldTest() {
    chmod(root.c_str(), 0755);
    chmod(folder.c_str(), 01777);
  }

  /// A program that has added 1 and goes on.
  static pid_t startWriter() {
    return untilItStops(start([] {
      add(1);
      kill(getpid(), SIGSTOP);
    }));
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
  /// Reads what the store holds and, if wanted, what is still waiting.
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
  std::int64_t figure(const char* name) { return sum(std::string("com.norvane.brimhold.") + name); }
  SqliteConnection connection() {
    return openStoreForWriting(store(), std::make_shared<BusyBudget>(1000));
  }
  std::filesystem::path store() { return LinuxPlatform(DeviceRoot(root)).store().path(); }

  KeptLog log;
};

}  // namespace tavrel
