// The statistics store in a SQLite file of the device.
//
// The file is opened only to read or write and then closed, so that a run with nothing to do never
// touches it. Scalars that a run sets wait in memory; the checkpoint and the end of the run each
// commit them in one transaction.
//
//   SqliteStore store(root, clock, preferences, log);
//   store.BHClientSetValueForScalarKey("com.example.starts", 3);
//   store.commit();
//
// Each failure is one line in the system log. Values that cannot be committed are kept in
// a file beside the store for the next commit or, when that fails too, in memory.
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "base/expected.h"
#include "base/limits.h"
#include "platform/clock.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/store/sqlite_batch.h"
#include "platform/linux/store/sqlite_erasure.h"
#include "platform/linux/store/sqlite_history.h"
#include "platform/linux/store/sqlite_schema.h"
#include "platform/linux/store/sqlite_site.h"
#include "platform/linux/store/sqlite_trim.h"
#include "platform/preferences.h"
#include "platform/statistics_store.h"
#include "platform/system_log.h"

namespace tavrel {

class SqliteStore : public StatisticsStore {
 public:
  /// The services must outlive the store. `busyMilliseconds`: how long a locked store is waited
  /// for, in all operations together. `changesNothing`: the store is only read; see `StoreSite`.
  SqliteStore(const DeviceRoot& root, Clock& clock, Preferences& preferences, SystemLog& log,
              int busyMilliseconds = limits::kStoreBusyMilliseconds, bool changesNothing = false);
  ~SqliteStore() override;

  std::int32_t BHDaysSince1970() override;
  plist::Date dateForDaysSince1970(std::int32_t day) override;

  /// When other processes are reading or writing all the time that is waited for, what they still
  /// need stays in the log; a line says so, and the next checkpoint moves it.
  bool BHClientCheckpoint() override;
  void BHClientSetValueForScalarKey(std::string_view key, std::int64_t value) override;
  std::unique_ptr<BHHistory> initWithDefaultPath() override;

  /// Commits the values set so far and those that were kept. False when they are in memory only.
  bool commit();

  /// The store's file, under the device root.
  const std::string& path() const { return site_.path; }

  /// A transaction of many changes; the store is created when there is none.
  Expected<std::unique_ptr<SqliteBatch>> beginBatch(Sharing sharing = Sharing::WithReaders);

  /// Gives a batch up that has failed with `error`. Done when the store was damaged and has been
  /// set aside: the next batch fills a new one. Otherwise the error, with what was in the way.
  Status replaceDamaged(std::unique_ptr<SqliteBatch> batch, const Error& error);

  /// To remove days; null when there is no store.
  Expected<std::unique_ptr<SqliteTrim>> beginTrim();

  /// The history with its wider set of queries; without rows when there is no store yet.
  Expected<std::unique_ptr<SqliteHistory>> openHistory();

  /// Removes rows, also those that are kept beside the store, and overwrites what they held. After
  /// a failure some may be gone. What a damaged store holds is set aside with it; unless everything
  /// was to go, that is a failure.
  Expected<ErasedRows> erase(const RowRange& range);

 private:
  SqliteConnection openForWriting(Sharing sharing);
  /// Keeps the values that a failure has left uncommitted. False when they could not be kept.
  bool keep(const StoreFailure& failure);
  /// As above; hands on the connection when something was committed.
  bool commit(std::optional<SqliteConnection>& connection);
  /// Opens the store when there is a log and no connection.
  void checkpoint(std::optional<SqliteConnection> connection);
  std::unique_ptr<SqliteHistory> openForReading(const std::optional<FileIdentity>& identity);

  /// Runs `operation` with the identity of the store's file. When it finds the store damaged, sets
  /// that aside and runs the operation once more. Yields the remaining failure.
  template <class Operation>
  std::optional<StoreFailure> attempt(Operation operation);

  StoreSite site_;
  // By day and key.
  std::map<std::pair<std::int32_t, std::string>, std::int64_t> pending_;
};

}  // namespace tavrel
