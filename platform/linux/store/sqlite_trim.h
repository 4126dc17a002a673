// Removes whole days from the statistics store and gives their space back to the file system.
//
//   auto trim = store.beginTrim();
//   if (!trim || !*trim) return;
//   for (const std::int32_t day : *(*trim)->days()) (*trim)->removeDay(day);
//   (*trim)->giveBack(reserve);
//
// `removeDay` and `giveBack` work in small transactions with pauses between them, so other writers
// wait only milliseconds. Each transaction removes rows with their values: after a kill a day may
// be partly removed, and the next trim continues. The cost depends on what is removed, not on what
// stays.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <sys/types.h>
#include <type_traits>
#include <utility>
#include <vector>

#include "base/expected.h"
#include "platform/linux/store/sqlite_connection.h"
#include "platform/linux/store/sqlite_site.h"

namespace tavrel {

class SqliteTrim {
 public:
  /// `file`: the store that the connection has opened.
  SqliteTrim(SqliteConnection connection, const StoreSite& site, std::optional<FileIdentity> file)
      : connection_(std::move(connection)), site_(site), file_(file) {}

  /// The days that have statistics, ascending. Costs two look-ups per day.
  Expected<std::vector<std::int32_t>> days();
  /// Those that can be found where the device cannot read part of the store.
  std::vector<std::int32_t> readableDays();

  /// Bytes of the pages in use, without the log and without the positions of segments, which belong
  /// to no day.
  Expected<std::int64_t> bytesInUse();

  /// Removes the scalars and distributions of a day. On a full disk it manages with little room
  /// before it fails.
  Status removeDay(std::int32_t day);

  /// Shortens the file until at most `freeBytesKept` of it are free. A store created without
  /// support for that is converted once, if it is small and the file system has room; a larger one
  /// keeps its free pages for later values.
  Status giveBack(std::int64_t freeBytesKept);

  /// Damage in the store that has made the last operation fail.
  const std::optional<StoreDamage>& damage() const { return damage_; }

 private:
  struct Row;

  /// The outcome of `operation`, or the failure that it throws.
  template <class Operation>
  std::invoke_result_t<Operation> attempt(Operation operation);
  Error note(const StoreFailure& failure);
  Status inSteps(std::int64_t budget, const std::function<bool(std::int64_t budget)>& step);
  bool removeSome(std::int32_t day, std::int64_t budget);
  std::int64_t removeScalars(std::int32_t day, std::int64_t budget);
  std::int64_t removeDistributions(std::int32_t day, std::int64_t budget);
  bool removeRow(std::int32_t day, Row& row, std::int64_t& budget);
  bool canBeConverted(std::int64_t bytes);
  void limitLog(off_t bytes);

  SqliteConnection connection_;
  StoreSite site_;
  const std::optional<FileIdentity> file_;
  std::optional<StoreDamage> damage_;
};

/// As `SqliteTrim::days`; throws `StoreFailure`.
std::vector<std::int32_t> daysIn(SqliteConnection& connection);

/// As `SqliteTrim::bytesInUse`; throws `StoreFailure`.
std::int64_t bytesInUseOf(SqliteConnection& connection);

}  // namespace tavrel
