// Keeps the device's storage within its limits.
//
// Files go first, because removing them needs no room; on a full disk the store can then be
// shortened too. Statistics of the day count what was removed.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/limits/device_limits.h"
#include "platform/linux/limits/kept_files.h"
#include "platform/linux/store/sqlite_store.h"
#include "platform/preferences.h"
#include "platform/property_list_coding.h"

namespace tavrel {

/// A line for each failure of the last tidy; missing when there was none.
inline constexpr std::string_view kTidyFailuresFile = "/var/lib/tavrel/tidy-failures";

/// Counts `TidiedKind::early`. A store that is as old as its limit gives up a day each day; one
/// that is too large gives them up early.
inline constexpr std::string_view kEarlyDaysStatistic =
    "com.norvane.tavrel.limits.store.early_days";

struct TidiedKind {
  const KeptKind* kind = nullptr;
  Bounds bounds;
  std::int64_t removed = 0;        // items
  std::int64_t early = 0;          // of these, days of the store within its limit of days
  std::vector<std::int32_t> days;  // of the store, the removed ones
  // The days that must stay exceed the store's bounds, and no daily run is due that would free one.
  bool exceeds = false;
};

struct TidyReport {
  std::vector<TidiedKind> kinds;      // all of them, in their order
  std::vector<std::string> failures;  // a line each; the rest was done
};

struct MeasuredKind {
  const KeptKind* kind;
  Bounds bounds;
  KeptUse use;  // of the store: items are days
};

class Tidy {
 public:
  /// All must outlive it.
  Tidy(const DeviceRoot& root, FileSystem& files, PropertyListCoding& propertyLists,
       Preferences& preferences, SqliteStore& store)
      : root_(root),
        files_(files),
        propertyLists_(propertyLists),
        preferences_(preferences),
        store_(store) {}

  /// Removes what exceeds the limits. Waits up to ten minutes while another process does so. Writes
  /// failures to `kTidyFailuresFile`.
  TidyReport run();

  /// What is stored, with its bounds. Changes nothing.
  Expected<std::vector<MeasuredKind>> measure();

 private:
  void trim(TidyReport& report);
  void remember(const TidyReport& report);
  void trimStore(const Bounds& bounds, TidiedKind& tidied, std::vector<std::string>& failures);
  std::vector<std::int32_t> removalOrder(const std::vector<std::int32_t>& days);
  std::optional<std::int64_t> lastRunDay();
  Expected<KeptUse> measureStore();
  void count(const TidyReport& report, std::vector<std::string>& failures);

  const DeviceRoot& root_;
  FileSystem& files_;
  PropertyListCoding& propertyLists_;
  Preferences& preferences_;
  SqliteStore& store_;
};

}  // namespace tavrel
