// The path of the statistics store, and what to do when its file turns out to be unusable.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <type_traits>

#include "base/expected.h"
#include "platform/clock.h"
#include "platform/linux/files/descriptor.h"
#include "platform/linux/store/sqlite_connection.h"
#include "platform/preferences.h"
#include "platform/system_log.h"

namespace tavrel {

/// The identity of the file at a path.
struct FileIdentity {
  std::uint64_t device = 0;
  std::uint64_t inode = 0;
  bool operator==(const FileIdentity&) const = default;

  /// The file at `path` now; nothing when there is none.
  static std::optional<FileIdentity> of(const std::string& path);
};

/// Removes the permissions of other users from the store and its log files, if they exist and
/// belong to this user.
void withholdFromOthers(const std::string& path);

/// The file at a path, with its size and last change.
struct FileVersion {
  FileIdentity identity;
  std::int64_t bytes = 0;
  std::int64_t seconds = 0;  // of its last change, with nanoseconds
  std::int64_t nanoseconds = 0;
  bool operator==(const FileVersion&) const = default;

  static std::optional<FileVersion> of(const std::string& path);
};

/// Held while the store's file is created or set aside, so that only one process does so. It locks
/// the store's folder, and ends with the process.
class StoreFolderLock {
 public:
  /// Throws `StoreFailure` when the lock cannot be taken in time.
  StoreFolderLock(const std::string& storePath, BusyBudget& busy);

 private:
  Descriptor descriptor_;
};

/// The rows that a damaged store took with it when it was set aside.
struct StoreLoss {
  std::int64_t lastDay;  // in UTC; before all days when there was none
  StoreFailure failure;  // why the rows are missing
};

/// Damage that has made an operation fail, and the damaged file.
struct StoreDamage {
  std::optional<FileIdentity> file;
  StoreFailure failure;
};

/// The store's path, and the services to which failures are reported, which must outlive it.
struct StoreSite {
  std::string path;
  std::shared_ptr<BusyBudget> busy;
  Clock& clock;
  Preferences& preferences;
  SystemLog& log;
  /// For readers that change nothing: a damaged store stays where it is, and reading makes no log
  /// files beside the store.
  bool changesNothing = false;
  /// Failures already logged. Those that last until somebody intervenes are logged only once.
  std::shared_ptr<std::set<std::string>> logged = std::make_shared<std::set<std::string>>();

  /// "statistics store PATH: MESSAGE".
  std::string describe(const StoreFailure& failure) const;

  /// The outcome of `operation`, or the description of the failure that it throws.
  template <class Operation>
  std::invoke_result_t<Operation> attempt(Operation operation) const {
    try {
      return operation();
    } catch (const StoreFailure& failure) {
      return Error{describe(failure)};
    }
  }

  /// One line in the system log, with `consequence` at its end.
  void logFailure(const StoreFailure& failure, std::string_view consequence = {}) const;

  /// Renames a damaged store and its log files, counts and logs that, once a second look has
  /// confirmed the damage. `damaged` is the file that was found damaged: nothing is done when
  /// another process has already replaced it. Returns the failure, with the reason when the store
  /// could not be moved. No connection to the store may be open.
  std::optional<StoreFailure> setAside(const std::optional<FileIdentity>& damaged,
                                       const StoreFailure& failure) const;

  /// What the latest of the stores took that were set aside, by any process, and are still there.
  /// It had rows of days up to when it was set aside or, when the clock was clearly wrong then, up
  /// to its last change, unless that is after today. When they cannot be listed, rows of any day
  /// may be missing.
  StoreLoss lastLoss() const;
};

}  // namespace tavrel
