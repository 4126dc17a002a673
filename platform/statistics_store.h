// The device's statistics store: named scalars and distributions, kept per day.
//
// `StatisticsStore` is the client that writes and knows the calendar; `BHHistory` reads. A day is
// the number of days since 1970-01-01 UTC.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string_view>
#include <utility>

#include "base/plist.h"
#include "platform/distribution_values.h"

namespace tavrel {

/// The preference that counts stores that were found damaged and set aside.
inline constexpr std::string_view kStoreCorruptionsDomain = "com.norvane.tallied";
inline constexpr std::string_view kStoreCorruptionsKey = "DatabaseCorruptionCount";

/// Yields the values of one distribution row in the order in which they were recorded. Values are
/// fetched from the store in blocks, and only on demand.
class BHHistoryDistributionEnumerator {
 public:
  using Sample = DistributionSample;

  virtual ~BHHistoryDistributionEnumerator() = default;

  /// True with the next value and its offset in seconds within the day; false when none is left.
  bool getNextValue(double& value, std::uint32_t& secondsInDayOffset) {
    if (block_.values.empty()) block_ = nextBlock(true);
    if (block_.values.empty()) return false;
    value = packedValueAt(block_.values.data());
    secondsInDayOffset = packedOffsetAt(block_.offsets.data());
    block_.values.remove_prefix(kPackedValueBytes);
    block_.offsets.remove_prefix(kPackedOffsetBytes);
    return true;
  }

  /// The next values in packed form (platform/distribution_values.h), for callers that want many at
  /// once and no offsets; empty when none is left. They stay valid until the next call.
  std::string_view nextValues() {
    if (!block_.values.empty()) return std::exchange(block_, {}).values;
    return nextBlock(false).values;
  }

  /// True when values are missing because they could not be read; the reason has been reported.
  bool failed() const { return failed_; }

 protected:
  /// The next values, with their offsets when wanted; valid until the next call. Empty when none is
  /// left.
  virtual DistributionBlock nextBlock(bool wantsOffsets) = 0;
  /// Call this before `nextBlock` yields nothing because of a failure.
  void fail() { failed_ = true; }

 private:
  DistributionBlock block_;
  bool failed_ = false;
};

/// A reader of the store. Queries select the rows whose key begins with the prefix and whose day is
/// greater than `minDaysSince1970` and at most `maxDaysSince1970`. Rows arrive ordered by key
/// (bytewise), then by day, before the query returns; the handler may set `stop` to end it early.
/// Bounds have more bits than days, so that they can express the day before the first one.
///
/// A query returns false when rows or values are missing because the store could not be read. The
/// system log has the reason.
class BHHistory {
 public:
  using ScalarRowHandler =
      std::function<void(std::string_view key, std::int32_t day, std::int64_t value, bool& stop)>;
  /// The enumerator is valid during the call.
  using DistributionRowHandler = std::function<void(
      std::string_view key, std::int32_t day, BHHistoryDistributionEnumerator& values, bool& stop)>;

  virtual ~BHHistory() = default;

  virtual bool scalarsForKeyPrefix(std::string_view prefix, std::int64_t minDaysSince1970,
                                   std::int64_t maxDaysSince1970,
                                   const ScalarRowHandler& rowHandler) = 0;
  virtual bool distributionsForKeyPrefix(std::string_view prefix, std::int64_t minDaysSince1970,
                                         std::int64_t maxDaysSince1970,
                                         const DistributionRowHandler& rowHandler) = 0;
};

class StatisticsStore {
 public:
  virtual ~StatisticsStore() = default;

  /// Today's day number.
  virtual std::int32_t BHDaysSince1970() = 0;

  /// The instant at which a day begins.
  virtual plist::Date dateForDaysSince1970(std::int32_t day) = 0;

  /// Commits the values set so far and moves the write-ahead log into the database. False when
  /// the values would be lost at the end of the process.
  virtual bool BHClientCheckpoint() = 0;

  /// Sets today's value of a scalar. Values are committed together, at the next checkpoint and at
  /// the end of the run.
  virtual void BHClientSetValueForScalarKey(std::string_view key, std::int64_t value) = 0;

  /// The history at its default location. A store that cannot be read is reported to the system
  /// log, and the history then has no rows. A store that does not exist yet has none either, but
  /// none are missing.
  virtual std::unique_ptr<BHHistory> initWithDefaultPath() = 0;
};

}  // namespace tavrel
