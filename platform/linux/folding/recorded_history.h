// The store and the values that wait for the next fold, read as one.
//
//   auto history = RecordedHistory::open(root, store, recorders, selection);
//   if (history) history->walkScalars(handler);
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "base/expected.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/folding/recorders.h"
#include "platform/linux/folding/waiting_values.h"
#include "platform/linux/store/sqlite_history.h"
#include "platform/linux/store/sqlite_store.h"

namespace tavrel {

class RecordedHistory {
 public:
  /// Later changes of the store and of the segments are not seen. When this user may not read the
  /// store, only the waiting values are read, and `storeFault` says why.
  static Expected<RecordedHistory> open(const DeviceRoot& root, SqliteStore& store,
                                        const Recorders& recorders, RowSelection selection);

  /// The selected rows, as `SqliteHistory` walks them: by day, then by key.
  Status walkScalars(const BHHistory::ScalarRowHandler& rowHandler);
  Status walkDistributions(const SqliteHistory::CountedRowHandler& rowHandler);

  /// False when the store lacks rows of days after `dayBefore`; the system log has the reason.
  bool isStoreComplete(std::int64_t dayBefore) { return stored_ && stored_->isComplete(dayBefore); }

  /// The first and the last day with a row: any row of the store, or a selected one that waits.
  /// Nothing when there is no such row.
  Expected<std::optional<SqliteHistory::DaySpan>> daysHeld();

  /// Why the store is not read; nothing when it is.
  const std::optional<Error>& storeFault() const { return storeFault_; }
  /// Which waiting values are missing, for people, in a line each.
  const std::vector<std::string>& missingValues() const { return missingValues_; }
  /// All that is missing, for people, in a line each.
  std::vector<std::string> warnings() const;

 private:
  RecordedHistory() = default;
  Status walkStoredScalars(const BHHistory::ScalarRowHandler& rowHandler);
  Status walkStoredDistributions(const SqliteHistory::CountedRowHandler& rowHandler);

  RowSelection selection_;
  std::unique_ptr<SqliteHistory> stored_;  // null when unreadable
  std::optional<WaitingValues> waiting_;   // nothing without a segment folder
  std::optional<Error> storeFault_;
  std::vector<std::string> missingValues_;
};

}  // namespace tavrel
