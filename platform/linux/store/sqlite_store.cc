#include "platform/linux/store/sqlite_store.h"

#include <algorithm>
#include <filesystem>
#include <limits>
#include <optional>
#include <system_error>
#include <utility>

#include "base/instant.h"
#include "platform/guarded.h"
#include "platform/linux/store/damage_check.h"
#include "platform/linux/store/sqlite_log_file.h"
#include "platform/store_path.h"

namespace tavrel {

SqliteStore::SqliteStore(const DeviceRoot& root, Clock& clock, Preferences& preferences,
                         SystemLog& log, int busyMilliseconds, bool changesNothing)
    : site_{root.path(kStorePath),
            std::make_shared<BusyBudget>(busyMilliseconds),
            clock,
            preferences,
            log,
            changesNothing} {}

SqliteStore::~SqliteStore() {
  if (pending_.empty()) return;
  runGuarded(site_.log, "commit the last statistics", [this] { commit(); });
}

std::int32_t SqliteStore::BHDaysSince1970() {
  constexpr std::int64_t kLast = std::numeric_limits<std::int32_t>::max();
  constexpr std::int64_t kFirst = std::numeric_limits<std::int32_t>::min();
  return static_cast<std::int32_t>(std::clamp(dayOf(site_.clock.now()), kFirst, kLast));
}

plist::Date SqliteStore::dateForDaysSince1970(std::int32_t day) {
  return plist::Date::ofDay(day);
}

void SqliteStore::BHClientSetValueForScalarKey(std::string_view key, std::int64_t value) {
  if (key.size() > limits::kStoreKeyBytes) {
    site_.log.write(LogLevel::Error, site_.describe({StoreFault::Other,
                                                     "a key of " + std::to_string(key.size()) +
                                                         " bytes is refused: use a shorter one"}));
    return;
  }
  pending_[{BHDaysSince1970(), std::string(key)}] = value;
}

SqliteConnection SqliteStore::openForWriting(Sharing sharing) {
  const std::filesystem::path folder = std::filesystem::path(site_.path).parent_path();
  std::error_code code;
  std::filesystem::create_directories(folder, code);
  if (code) {
    // The lowest folder above that is there; a relative path may have none.
    std::filesystem::path above = folder.parent_path();
    std::error_code ignored;
    while (above.has_relative_path() && !std::filesystem::exists(above, ignored))
      above = above.parent_path();
    const std::string checkOwner = "check owner and permissions of " + above.string();
    throw StoreFailure{StoreFault::Refused, "its folder cannot be made: " + code.message() + ": " +
                                                adviceFor(code.value(), checkOwner.c_str())};
  }
  return openStoreForWriting(site_.path, site_.busy, sharing);
}

template <class Operation>
std::optional<StoreFailure> SqliteStore::attempt(Operation operation) {
  for (bool again = false;; again = true) {
    const auto identity = FileIdentity::of(site_.path);
    try {
      operation(identity);
      return std::nullopt;
    } catch (const StoreFailure& failure) {
      if (failure.fault != StoreFault::Damaged || again) return failure;
      if (auto obstacle = site_.setAside(identity, failure)) return obstacle;
    }
  }
}

bool SqliteStore::commit() {
  std::optional<SqliteConnection> connection;
  return commit(connection);
}

bool SqliteStore::commit(std::optional<SqliteConnection>& connection) {
  if (pending_.empty() && !KeptValues(site_.path).exist()) return true;
  const auto failure = attempt([&](const auto&) {
    SqliteBatch batch(openForWriting(Sharing::Avoided), site_);
    for (const auto& [name, value] : pending_)
      batch.putScalar(name.first, name.second, value);
    batch.finish();
    connection = batch.release();
  });
  if (failure && !keep(*failure)) return false;
  pending_.clear();
  return true;
}

bool SqliteStore::keep(const StoreFailure& failure) {
  if (pending_.empty()) {
    site_.logFailure(failure, "; kept values wait for the next commit");
    return true;
  }
  std::vector<KeptValue> values;
  values.reserve(pending_.size());
  for (const auto& [name, value] : pending_)
    values.push_back({0, name.first, value, name.second});
  const bool isOne = values.size() == 1;
  const std::string count = "; " + std::to_string(values.size()) + (isOne ? " value " : " values ");
  try {
    const StoreFolderLock lock(site_.path, *site_.busy);
    KeptValues kept(site_.path);
    const std::string damage = kept.setAsideIfDamaged();
    if (!damage.empty()) site_.log.write(LogLevel::Error, damage);
    const auto dropped = kept.add(std::move(values));
    if (!dropped) throw StoreFailure{StoreFault::Device, dropped.error().message};
    site_.logFailure(failure, count + (isOne ? "waits" : "wait") + " for the next commit");
    if (*dropped > 0) {
      site_.log.log(LogLevel::Error, "%s-kept is full: the %llu earliest values are dropped",
                    site_.path, std::uint64_t{*dropped});
    }
    return true;
  } catch (const StoreFailure& obstacle) {
    site_.logFailure(failure,
                     count + (isOne ? "is" : "are") + " not kept yet: " + obstacle.message);
    return false;
  }
}

bool SqliteStore::BHClientCheckpoint() {
  std::optional<SqliteConnection> connection;
  const bool areKept = commit(connection);
  checkpoint(std::move(connection));
  return areKept;
}

void SqliteStore::checkpoint(std::optional<SqliteConnection> connection) {
  if (!logHoldsPages(site_.path)) return;
  const auto failure = attempt([&](const auto& identity) {
    // No store: it has just been set aside with its log.
    if (!identity) return;
    // Owned here, so that a failure closes the connection.
    SqliteConnection own =
        connection ? *std::exchange(connection, std::nullopt) : openForWriting(Sharing::Avoided);
    if (!own.checkpoint()) {
      site_.log.write(LogLevel::Default,
                      site_.describe({StoreFault::Busy,
                                      "other processes still use the write-ahead log: what they "
                                      "need stays there until the next checkpoint"}));
    }
  });
  if (failure) site_.logFailure(*failure);
}

Expected<ErasedRows> SqliteStore::erase(const RowRange& range) {
  ErasedRows erased;
  bool isSetAside = false;
  const auto failure = attempt([&](const auto& identity) {
    if (std::exchange(isSetAside, true) && range != RowRange()) {
      throw StoreFailure{StoreFault::Other,
                         "it was damaged and is set aside with what was to be erased: remove that "
                         "file"};
    }
    if (!identity && !KeptValues(site_.path).exist()) return;
    SqliteBatch batch(openForWriting(Sharing::WithReaders), site_);
    batch.begin();
    batch.finish();
    SqliteConnection connection = batch.release();
    // A search among rows out of order misses some that are to be erased.
    if (!isSound(connection)) {
      throw StoreFailure{StoreFault::Damaged, "SQLite's check finds it damaged"};
    }
    StoreErasure erasure(connection, site_.path);
    {
      const StoreFolderLock lock(site_.path, *site_.busy);
      erasure.clearFreePages();
    }
    erased = erasure.eraseRows(range);
    if (range == RowRange()) erasure.eraseStrayChunks();
    erased.isCopied = erasure.copyPages();
    erased.isLogEmpty = erasure.emptyLog();
  });
  if (failure) return Error{site_.describe(*failure)};
  return erased;
}

std::unique_ptr<SqliteHistory> SqliteStore::openForReading(
    const std::optional<FileIdentity>& identity) {
  return std::make_unique<SqliteHistory>(
      site_, identity, openStoreForReading(site_.path, site_.busy, site_.changesNothing));
}

std::unique_ptr<SqliteHistory> SqliteStore::openOrReport() {
  std::unique_ptr<SqliteHistory> history;
  const auto failure = attempt([&](const auto& identity) { history = openForReading(identity); });
  if (failure) {
    site_.logFailure(*failure);
    history = std::make_unique<SqliteHistory>(site_, std::nullopt, std::nullopt);
    history->setIncomplete();
  } else if (!history->hasStore()) {
    site_.log.write(LogLevel::Info,
                    site_.describe({StoreFault::Other, "nothing has been recorded yet"}));
  }
  return history;
}

Expected<std::unique_ptr<SqliteHistory>> SqliteStore::openHistory() {
  std::unique_ptr<SqliteHistory> history;
  const auto failure = attempt([&](const auto& identity) { history = openForReading(identity); });
  if (failure) return Error{site_.describe(*failure)};
  return history;
}

Expected<std::unique_ptr<SqliteBatch>> SqliteStore::beginBatch(Sharing sharing) {
  std::unique_ptr<SqliteBatch> batch;
  const auto failure = attempt([&](const auto& identity) {
    batch = std::make_unique<SqliteBatch>(openForWriting(sharing), site_, identity);
  });
  if (failure) return Error{site_.describe(*failure)};
  return batch;
}

Status SqliteStore::setAside(const StoreDamage& damage) {
  if (const auto obstacle = site_.setAside(damage.file, damage.failure)) {
    return Error{site_.describe(*obstacle)};
  }
  return Done{};
}

Expected<std::unique_ptr<SqliteTrim>> SqliteStore::beginTrim() {
  std::unique_ptr<SqliteTrim> trim;
  const auto failure = attempt([&](const auto& identity) {
    if (!identity) return;
    SqliteConnection connection = openForWriting(Sharing::WithReaders);
    // The pages of an interrupted erasure would count as the store's, and whole days would be
    // removed to make up for them.
    if (StoreErasure::hasLeftPages(connection)) {
      const StoreFolderLock lock(site_.path, *site_.busy);
      StoreErasure::dropPages(connection);
    }
    trim = std::make_unique<SqliteTrim>(std::move(connection), site_, identity);
  });
  if (failure) return Error{site_.describe(*failure)};
  return trim;
}

}  // namespace tavrel
