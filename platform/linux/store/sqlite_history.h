// The reader of the statistics store.
//
// Each query sees the store as it was when the query began, whatever others write in the meantime.
// The values of a distribution are read only on demand, one chunk at a time.
//
//   auto history = store.openHistory();
//   if (history) (*history)->walkScalars("com.example.", first, last, handler);
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/expected.h"
#include "platform/linux/store/sqlite_schema.h"
#include "platform/linux/store/sqlite_segments.h"
#include "platform/linux/store/sqlite_site.h"
#include "platform/statistics_store.h"

namespace tavrel {

class ChunkReader;

class SqliteHistory : public BHHistory {
 public:
  /// A history without a store has no rows. `identity` is that of the store's file before it was
  /// opened. The services of `site` must outlive the history.
  SqliteHistory(StoreSite site, std::optional<FileIdentity> identity,
                std::optional<ReadableStore> store);

  /// From now on each query says that rows are missing.
  void setIncomplete() { isIncomplete_ = true; }

  /// False when rows of days after `dayBefore` are missing, here or because a damaged store has
  /// taken them with it; the system log has the reason.
  bool isComplete(std::int64_t dayBefore);

  bool scalarsForKeyPrefix(std::string_view prefix, std::int64_t minDaysSince1970,
                           std::int64_t maxDaysSince1970,
                           const ScalarRowHandler& rowHandler) override;
  bool distributionsForKeyPrefix(std::string_view prefix, std::int64_t minDaysSince1970,
                                 std::int64_t maxDaysSince1970,
                                 const DistributionRowHandler& rowHandler) override;

  /// False when there is no store yet, or when it could not be read.
  bool hasStore() const { return store_.has_value(); }

  /// `count` is the number of values, known without reading them.
  using CountedRowHandler =
      std::function<void(std::string_view key, std::int32_t day, std::int64_t count,
                         BHHistoryDistributionEnumerator& values, bool& stop)>;

  /// Rows whose key begins with `prefix`, from `firstDay` to `lastDay`, both included, ordered by
  /// day and then by key. On failure the rows before it have been delivered. When some values of a
  /// distribution cannot be read, the walk still delivers all other rows and then fails.
  Status walkScalars(std::string_view prefix, std::int32_t firstDay, std::int32_t lastDay,
                     const ScalarRowHandler& rowHandler);
  Status walkDistributions(std::string_view prefix, std::int32_t firstDay, std::int32_t lastDay,
                           const CountedRowHandler& rowHandler);

  /// The rows of one key by day; otherwise as above. Costs one look-up for each day in the store.
  Status walkScalar(std::string_view key, std::int32_t firstDay, std::int32_t lastDay,
                    const ScalarRowHandler& rowHandler);
  Status walkDistribution(std::string_view key, std::int32_t firstDay, std::int32_t lastDay,
                          const CountedRowHandler& rowHandler);

  struct DaySpan {
    std::int32_t first = 0;
    std::int32_t last = 0;
  };
  /// The first and the last day in the store; nothing when the store is empty.
  Expected<std::optional<DaySpan>> daysHeld();
  /// All days that have statistics, ascending. Costs two look-ups per day.
  Expected<std::vector<std::int32_t>> days();
  /// Bytes of the pages in use, without the log and the positions of segments.
  Expected<std::int64_t> bytesInUse();

  /// How far a segment was folded; nothing when unknown. Consistent with the values read since
  /// `beginSnapshot`.
  Expected<std::optional<std::string>> segmentPosition(std::uint32_t owner,
                                                       std::span<const std::byte, 16> identity);

  struct Examination {
    bool isWhole = true;  // false: the time ran out, and no damage was found so far
    std::string fault;    // the first one that was found; empty when there is none
  };
  /// Looks for damage in the file, for about as long as `time`.
  Expected<Examination> examine(std::chrono::milliseconds time);

  /// From now on all queries see the store as it is at the first of them.
  Status beginSnapshot();

 private:
  enum class Order : std::uint8_t { KeyThenDay, DayThenKey };
  struct Selection;
  void readScalars(const Selection& selection, const ScalarRowHandler& rowHandler);
  /// Damage that SQLite finds ends the walk; rows whose values are otherwise missing are reported
  /// to `tell`.
  using FailureHandler = std::function<void(const StoreFailure& failure)>;
  void readDistributions(const Selection& selection, const CountedRowHandler& rowHandler,
                         const FailureHandler& tell);
  void readRow(SqliteStatement& row, ChunkReader& reader, const CountedRowHandler& rowHandler,
               const FailureHandler& tell, bool& stop) const;
  template <class Read>
  void readUnchanged(Read read);
  void checkUnchanged() const;
  template <class Read>
  Status attempt(Read read);
  template <class Read>
  Status attemptTellingAtEnd(Read read);
  void report(const StoreFailure& failure);

  StoreSite site_;
  std::optional<FileIdentity> identity_;
  std::optional<ReadableStore> store_;
  bool isIncomplete_ = false;
  std::optional<StoreLoss> loss_;          // once it is known
  std::int64_t version_ = kSchemaVersion;  // as it was when the query began
};

}  // namespace tavrel
