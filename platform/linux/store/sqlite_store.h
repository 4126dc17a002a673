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
  /// The services must outlive the store. `busyMilliseconds`: how long all operations together wait
  /// for a locked store. `changesNothing`: the store is only read; see `StoreSite`.
  SqliteStore(const DeviceRoot& root, Clock& clock, Preferences& preferences, SystemLog& log,
              int busyMilliseconds = limits::kStoreBusyMilliseconds, bool changesNothing = false);
  ~SqliteStore() override;

  std::int32_t BHDaysSince1970() override;
  plist::Date dateForDaysSince1970(std::int32_t day) override;

  /// When other processes use the store for the whole wait, the part of the log that they need
  /// stays; a line says so, and the next checkpoint moves it.
  bool BHClientCheckpoint() override;
  void BHClientSetValueForScalarKey(std::string_view key, std::int64_t value) override;
  std::unique_ptr<BHHistory> initWithDefaultPath() override { return openOrReport(); }

  /// Commits the values set so far and the kept ones. False when values remain in memory only.
  bool commit();

  /// The store's file, under the device root.
  const std::string& path() const { return site_.path; }

  /// Begins a transaction of many changes; creates the store when there is none.
  Expected<std::unique_ptr<SqliteBatch>> beginBatch(Sharing sharing = Sharing::WithReaders);

  /// Discards a batch or a trim that has failed with `error`. Succeeds when the store was damaged
  /// and has been set aside: the next batch fills a new one. Otherwise returns the error, or why
  /// the store was not set aside.
  template <class Work>
  Status replaceDamaged(std::unique_ptr<Work> work, const Error& error) {
    const std::optional<StoreDamage> damage = work->damage();
    work.reset();
    return damage ? setAside(*damage) : error;
  }

  /// Opens the store to remove days; null when there is none.
  Expected<std::unique_ptr<SqliteTrim>> beginTrim();

  /// The history that `initWithDefaultPath` returns.
  std::unique_ptr<SqliteHistory> openOrReport();

  /// The history with its wider set of queries; without rows when there is no store yet.
  Expected<std::unique_ptr<SqliteHistory>> openHistory();

  /// Removes rows, including values kept beside the store, and overwrites their content. After a
  /// failure some may be gone. A damaged store is set aside with its content, which is a failure
  /// unless all rows were to be removed.
  Expected<ErasedRows> erase(const RowRange& range);

 private:
  Status setAside(const StoreDamage& damage);
  SqliteConnection openForWriting(Sharing sharing);
  /// Keeps the values that `failure` has left uncommitted. False when they could not be kept.
  bool keep(const StoreFailure& failure);
  /// As above; hands on the connection when something was committed.
  bool commit(std::optional<SqliteConnection>& connection);
  /// Without a connection, opens the store if it has a log.
  void checkpoint(std::optional<SqliteConnection> connection);
  std::unique_ptr<SqliteHistory> openForReading(const std::optional<FileIdentity>& identity);

  /// Runs `operation` with the identity of the store's file. When it finds the store damaged, sets
  /// the store aside and runs the operation once more. Returns the remaining failure.
  template <class Operation>
  std::optional<StoreFailure> attempt(Operation operation);

  StoreSite site_;
  // By day and key.
  std::map<std::pair<std::int32_t, std::string>, std::int64_t> pending_;
};

}  // namespace tavrel
