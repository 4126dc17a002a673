// Many changes to the statistics store in one transaction: all of them are kept, or none.
//
//   auto batch = store.beginBatch();
//   if (!batch) return batch.error();
//   (*batch)->setScalar(day, "com.example.starts", 3);
//   (*batch)->commit();
//
// Rows wait in memory up to a bound. Other writers wait from the first row written until the
// commit, so a small batch holds them up only while it commits. A batch that is not committed
// leaves nothing behind. After a failure it can only be discarded.
//
// Values that were kept beside the store (kept_values.h) are taken in before a batch's own.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <type_traits>
#include <vector>

#include "base/expected.h"
#include "platform/distribution_values.h"
#include "platform/linux/store/kept_values.h"
#include "platform/linux/store/pending_distributions.h"
#include "platform/linux/store/sqlite_connection.h"
#include "platform/linux/store/sqlite_segments.h"
#include "platform/linux/store/sqlite_site.h"
#include "platform/statistics_store.h"

namespace tavrel {

class SqliteBatch {
 public:
  /// `file` identifies the store's file, if it existed before the connection. Throws
  /// `StoreFailure`.
  SqliteBatch(SqliteConnection connection, const StoreSite& site,
              std::optional<FileIdentity> file = std::nullopt);
  ~SqliteBatch();
  SqliteBatch(const SqliteBatch&) = delete;
  SqliteBatch& operator=(const SqliteBatch&) = delete;

  /// A key longer than `limits::kStoreKeyBytes` is refused, here and below.
  Status setScalar(std::int32_t day, std::string_view key, std::int64_t value);
  /// Adds to the day's value, which is 0 when absent. A sum that overflows 64 bits is refused and
  /// leaves the value unchanged.
  Status addScalar(std::int32_t day, std::string_view key, std::int64_t amount);
  /// The day's value as this batch leaves it; nothing when there is none.
  Expected<std::optional<std::int64_t>> scalar(std::int32_t day, std::string_view key);
  Status appendValue(std::int32_t day, std::string_view key, std::uint32_t secondsInDayOffset,
                     double value);
  Status appendValues(std::int32_t day, std::string_view key,
                      std::span<const DistributionSample> samples);
  /// The waiting values, for callers that append many one by one and have checked the keys' length.
  /// Call `limitWaiting` after each segment's values.
  PendingDistributions& waitingDistributions() { return distributions_; }
  /// Writes them when they take too much memory.
  Status limitWaiting();

  /// How far a segment was folded, as an earlier batch stored it; nothing when unknown. From this
  /// call on other writers wait, so that nobody else folds the segment until the commit.
  Expected<std::optional<std::string>> segmentPosition(std::uint32_t owner,
                                                       std::span<const std::byte, 16> identity);
  /// The segments whose positions the store holds, by owner and then by identity.
  Expected<std::vector<SegmentName>> segmentNames();
  /// Bytes of the positions of one user's segments.
  Expected<std::int64_t> segmentPositionBytes(std::uint32_t owner);
  Status setSegmentPosition(std::uint32_t owner, std::span<const std::byte, 16> identity,
                            std::string_view position);
  Status removeSegmentPosition(std::uint32_t owner, std::span<const std::byte, 16> identity);

  /// As `SqliteTrim::bytesInUse`, including what this batch has written.
  Expected<std::int64_t> bytesInUse();

  /// From now on, values for a distribution whose row is damaged or full are dropped instead of
  /// failing the batch. The first such row is logged.
  void refuseUnwritableSeries() { refuses_ = true; }
  /// Writes the waiting distributions, and returns how many values were dropped so far.
  Expected<std::uint64_t> refusedValues();

  /// Keeps the changes and ends the batch.
  Status commit();

  /// Damage in the store that has made an operation fail.
  const std::optional<StoreDamage>& damage() const { return damage_; }

 private:
  friend class SqliteStore;
  struct Statements;

  // A scalar that waits to be written; its key is in `scalarKeys_`.
  struct PendingScalar {
    std::int32_t day;
    std::uint32_t keySize;
    std::size_t keyStart;
    std::int64_t value;
  };

  // For the store, which handles the `StoreFailure` that these four throw.

  /// Makes other writers wait, updates the store's schema and takes in kept values.
  void begin();
  /// As `setScalar` and `commit`.
  void putScalar(std::int32_t day, std::string_view key, std::int64_t value);
  void finish();
  /// Hands over the connection once the batch is finished.
  SqliteConnection release();

  void takeKeptValues();
  void setDamagedValuesAside();
  void removeTakenValues();
  void limitLog();
  void writeScalars();
  std::optional<std::int64_t> readScalar(std::int32_t day, std::string_view key);
  void writeScalar(std::int32_t day, std::string_view key, std::int64_t value);
  void writeDistributions();
  /// The outcome of `operation`, or the failure that it throws.
  template <class Operation>
  std::invoke_result_t<Operation> attempt(Operation operation);

  SqliteConnection connection_;
  StoreSite site_;
  const std::optional<FileIdentity> file_;
  std::optional<StoreDamage> damage_;
  KeptValues kept_;
  std::optional<std::uint32_t> takenNumber_;  // of the last values taken in
  std::unique_ptr<Statements> statements_;
  bool begun_ = false;
  std::vector<PendingScalar> scalars_;
  std::string scalarKeys_;
  PendingDistributions distributions_;
  bool refuses_ = false;
  std::uint64_t refused_ = 0;
};

}  // namespace tavrel
