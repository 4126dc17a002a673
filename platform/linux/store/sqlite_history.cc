#include "platform/linux/store/sqlite_history.h"

#include <algorithm>
#include <limits>
#include <string>
#include <utility>

#include "base/text.h"
#include "platform/linux/store/chunk_reader.h"
#include "platform/linux/store/sqlite_trim.h"
#include "platform/linux/store/time_limit.h"

namespace tavrel {
namespace {

StoreFailure inDistribution(std::string_view key, std::int32_t day, const StoreFailure& failure) {
  // The beginning of a long key is enough.
  return {failure.fault, "distribution " + quotedText(key.substr(0, 200)) + " of day " +
                             std::to_string(day) + ": " + failure.message};
}

class ChunkEnumerator : public BHHistoryDistributionEnumerator {
 public:
  // `row` is a current row of a store_sql::distributions query, and must stay on it.
  ChunkEnumerator(const SqliteStatement& row, std::int64_t version, ChunkReader& reader)
      : row_(row), version_(version), reader_(reader) {}
  ~ChunkEnumerator() override { reader_.end(); }
  ChunkEnumerator(const ChunkEnumerator&) = delete;
  ChunkEnumerator& operator=(const ChunkEnumerator&) = delete;

  const std::optional<StoreFailure>& failure() const { return failure_; }

 private:
  enum class State : std::uint8_t { Unread, Reading, Ended };

  DistributionBlock nextBlock(bool wantsOffsets) override {
    if (state_ == State::Ended) return {};
    try {
      if (state_ == State::Unread) begin();
      if (const auto block = reader_.next(wantsOffsets)) return *block;
    } catch (const StoreFailure& failure) {
      failure_ = failure;
      fail();
    }
    state_ = State::Ended;
    return {};
  }

  void begin() {
    const std::int64_t count = row_.integer(2);
    std::optional<std::vector<ChunkRun>> runs;
    if (version_ == kFirstSchemaVersion) {
      if (const auto run = runOfSeries(row_.integer(3), count)) runs = {*run};
    } else {
      runs = unpackRuns(row_.bytes(3));
    }
    if (!runs) {
      throw StoreFailure{StoreFault::Other,
                         "it refers to values that cannot exist: restore the file from a copy or "
                         "move it away"};
    }
    reader_.begin(std::move(*runs), count);
    state_ = State::Reading;
  }

  const SqliteStatement& row_;
  std::int64_t version_;
  ChunkReader& reader_;
  State state_ = State::Unread;
  std::optional<StoreFailure> failure_;
};

// Steps `next`, a query with store_sql::kNext, through the days that hold `key`, and calls `handle`
// for each row.
template <class Handle>
void eachDayOf(SqliteStatement& next, std::string_view key, std::int32_t firstDay,
               std::int32_t lastDay, Handle handle) {
  bool stop = false;
  for (std::int64_t day = firstDay; !stop && day <= lastDay;) {
    next.bind(1, day);
    next.bind(2, key);
    next.bind(3, lastDay);
    if (!next.step()) break;
    const std::string_view found = next.bytes(0);
    const std::int64_t asked = std::exchange(day, next.integer(1));
    if (found == key) handle(stop);
    // A later day that begins with a lower key may still have this one. In a damaged store a day
    // may not be an integer, and may appear not to be later.
    if (found >= key || day <= asked) day = std::max(day, asked) + 1;
    next.reset();
  }
  next.reset();
}

}  // namespace

struct SqliteHistory::Selection {
  std::string_view prefix;
  // Both included.
  std::int64_t firstDay;
  std::int64_t lastDay;
  Order order;
  std::optional<std::string> keyAbovePrefix = store_sql::keyAbove(prefix);

  /// The days above `minDay` and not above `maxDay`.
  static Selection between(std::string_view prefix, std::int64_t minDay, std::int64_t maxDay) {
    constexpr std::int64_t kFirst = std::numeric_limits<std::int32_t>::min();
    constexpr std::int64_t kLast = std::numeric_limits<std::int32_t>::max();
    return {prefix, std::clamp(minDay, kFirst - 1, kLast) + 1, std::min(maxDay, kLast),
            Order::KeyThenDay};
  }

  bool isEmpty() const { return firstDay > lastDay; }

  /// The rows of the selection, in its order.
  std::string_view rows() const {
    if (firstDay == lastDay) return store_sql::kOfDay;
    return order == Order::KeyThenDay ? store_sql::kByKey : store_sql::kByDay;
  }

  /// Binds the parameters of `rows()`. The selection must outlive the statement's run.
  void bind(SqliteStatement& statement) const {
    statement.bind(1, firstDay);
    if (firstDay == lastDay) return statement.bind(2, prefix);
    statement.bind(2, lastDay);
    statement.bind(3, prefix);
    if (keyAbovePrefix) {
      statement.bind(4, std::string_view(*keyAbovePrefix));
    } else {
      statement.bindNull(4);
    }
  }
};

SqliteHistory::SqliteHistory(StoreSite site, std::optional<FileIdentity> identity,
                             std::optional<ReadableStore> store)
    : site_(std::move(site)), identity_(identity), store_(std::move(store)) {}

bool SqliteHistory::scalarsForKeyPrefix(std::string_view prefix, std::int64_t minDaysSince1970,
                                        std::int64_t maxDaysSince1970,
                                        const ScalarRowHandler& rowHandler) {
  try {
    readUnchanged([&] {
      readScalars(Selection::between(prefix, minDaysSince1970, maxDaysSince1970), rowHandler);
    });
  } catch (const StoreFailure& failure) {
    report(failure);
    return false;
  }
  return isComplete(minDaysSince1970);
}

bool SqliteHistory::distributionsForKeyPrefix(std::string_view prefix,
                                              std::int64_t minDaysSince1970,
                                              std::int64_t maxDaysSince1970,
                                              const DistributionRowHandler& rowHandler) {
  bool isWhole = true;
  try {
    readUnchanged([&] {
      readDistributions(
          Selection::between(prefix, minDaysSince1970, maxDaysSince1970),
          [&rowHandler](std::string_view key, std::int32_t day, std::int64_t,
                        BHHistoryDistributionEnumerator& values,
                        bool& stop) { rowHandler(key, day, values, stop); },
          [&](const StoreFailure& failure) {
            site_.logFailure(failure);
            isWhole = false;
          });
    });
  } catch (const StoreFailure& failure) {
    report(failure);
    return false;
  }
  return isComplete(minDaysSince1970) && isWhole;
}

bool SqliteHistory::isComplete(std::int64_t dayBefore) {
  if (isIncomplete_) return false;
  if (!loss_) loss_ = site_.lastLoss();
  if (dayBefore >= loss_->lastDay) return true;
  site_.logFailure(loss_->failure);
  return false;
}

// Data read without locks is valid only if nobody has written in the meantime.
void SqliteHistory::checkUnchanged() const {
  if (!store_->lockless || FileVersion::of(site_.path) == store_->lockless) return;
  throw StoreFailure{StoreFault::Busy, "was written while it was read: run the command again"};
}

template <class Read>
void SqliteHistory::readUnchanged(Read read) {
  if (!store_) return;
  try {
    version_ = schemaVersion(store_->connection);
    try {
      read();
    } catch (const StoreFailure& failure) {
      // A writer may have converted the store since; the query has then not delivered any row yet.
      if (failure.fault != StoreFault::Foreign) throw;
      const auto before = std::exchange(version_, schemaVersion(store_->connection));
      if (version_ == before) throw;
      read();
    }
  } catch (const StoreFailure&) {
    checkUnchanged();
    throw;
  }
  checkUnchanged();
}

template <class Read>
Status SqliteHistory::attempt(Read read) {
  return site_.attempt([&]() -> Status {
    readUnchanged(read);
    return Done{};
  });
}

// `read` is given a handler for failures that concern one distribution.
template <class Read>
Status SqliteHistory::attemptTellingAtEnd(Read read) {
  std::optional<StoreFailure> first;
  std::int64_t others = 0;
  const FailureHandler tell = [&](const StoreFailure& failure) {
    if (first) return void(++others);
    first = failure;
  };
  if (Status done = attempt([&] { read(tell); }); !done) return done;
  if (!first) return Done{};
  std::string message = site_.describe(*first);
  if (others > 0) {
    message += "; " + std::to_string(others) + " more could not be read whole";
  }
  return Error{std::move(message)};
}

Status SqliteHistory::walkScalars(std::string_view prefix, std::int32_t firstDay,
                                  std::int32_t lastDay, const ScalarRowHandler& rowHandler) {
  return attempt([&] { readScalars({prefix, firstDay, lastDay, Order::DayThenKey}, rowHandler); });
}

Status SqliteHistory::walkDistributions(std::string_view prefix, std::int32_t firstDay,
                                        std::int32_t lastDay, const CountedRowHandler& rowHandler) {
  return attemptTellingAtEnd([&](const FailureHandler& tell) {
    readDistributions({prefix, firstDay, lastDay, Order::DayThenKey}, rowHandler, tell);
  });
}

Status SqliteHistory::walkScalar(std::string_view key, std::int32_t firstDay, std::int32_t lastDay,
                                 const ScalarRowHandler& rowHandler) {
  return attempt([&] {
    SqliteStatement next(store_->connection, store_sql::scalars(store_sql::kNext));
    eachDayOf(next, key, firstDay, lastDay, [&](bool& stop) {
      rowHandler(key, static_cast<std::int32_t>(next.integer(1)), next.integer(2), stop);
    });
  });
}

Status SqliteHistory::walkDistribution(std::string_view key, std::int32_t firstDay,
                                       std::int32_t lastDay, const CountedRowHandler& rowHandler) {
  return attemptTellingAtEnd([&](const FailureHandler& tell) {
    SqliteStatement next(store_->connection, store_sql::distributions(store_sql::kNext, version_));
    ChunkReader reader(store_->connection);
    eachDayOf(next, key, firstDay, lastDay,
              [&](bool& stop) { readRow(next, reader, rowHandler, tell, stop); });
  });
}

Expected<std::optional<SqliteHistory::DaySpan>> SqliteHistory::daysHeld() {
  std::optional<DaySpan> span;
  const Status read = attempt([&] {
    // One look-up at each end of each table.
    for (const char* table : {"scalars", "distributions"}) {
      for (const char* end : {"min", "max"}) {
        SqliteStatement statement(store_->connection,
                                  std::string("SELECT ") + end + "(day) FROM " + table);
        if (!statement.step() || statement.isNull(0)) break;
        const auto day = static_cast<std::int32_t>(statement.integer(0));
        if (!span) span = DaySpan{day, day};
        span->first = std::min(span->first, day);
        span->last = std::max(span->last, day);
      }
    }
  });
  if (!read) return read.error();
  return span;
}

Expected<std::vector<std::int32_t>> SqliteHistory::days() {
  std::vector<std::int32_t> days;
  const Status read = attempt([&] { days = daysIn(store_->connection); });
  if (!read) return read.error();
  return days;
}

Expected<std::int64_t> SqliteHistory::bytesInUse() {
  std::int64_t bytes = 0;
  const Status read = attempt([&] { bytes = bytesInUseOf(store_->connection); });
  if (!read) return read.error();
  return bytes;
}

Expected<std::optional<std::string>> SqliteHistory::segmentPosition(std::uint32_t owner,
                                                                    SegmentIdentity identity) {
  std::optional<std::string> position;
  const Status read = attempt([&] {
    if (version_ == kFirstSchemaVersion) return;
    position = segment_table::position(store_->connection, owner, identity);
  });
  if (!read) return read.error();
  return position;
}

Expected<SqliteHistory::Examination> SqliteHistory::examine(std::chrono::milliseconds time) {
  Examination examination;
  const Status read = attempt([&] {
    const TimeLimit limit(store_->connection, time);
    try {
      SqliteStatement statement(store_->connection, "PRAGMA quick_check(1)");
      if (!statement.step()) return;
      const std::string_view result = statement.bytes(0);
      if (result != "ok") examination.fault = result;
    } catch (const StoreFailure&) {
      if (!limit.hasPassed()) throw;
    }
    // A fault reported by an interrupted check may mean only that it was interrupted.
    examination.isWhole = !limit.hasPassed();
    if (!examination.isWhole) examination.fault.clear();
  });
  if (!read) return read.error();
  return examination;
}

Status SqliteHistory::beginSnapshot() {
  return attempt([&] { store_->connection.execute("BEGIN"); });
}

void SqliteHistory::readScalars(const Selection& selection, const ScalarRowHandler& rowHandler) {
  if (selection.isEmpty()) return;
  SqliteStatement rows(store_->connection, store_sql::scalars(selection.rows()));
  selection.bind(rows);
  bool stop = false;
  while (!stop && rows.step()) {
    const std::string_view key = rows.bytes(0);
    // The query for one day has no upper bound: the first key without the prefix comes after all
    // that have it.
    if (!key.starts_with(selection.prefix)) break;
    rowHandler(key, static_cast<std::int32_t>(rows.integer(1)), rows.integer(2), stop);
  }
}

void SqliteHistory::readDistributions(const Selection& selection,
                                      const CountedRowHandler& rowHandler,
                                      const FailureHandler& tell) {
  if (selection.isEmpty()) return;
  SqliteStatement rows(store_->connection, store_sql::distributions(selection.rows(), version_));
  ChunkReader reader(store_->connection);
  selection.bind(rows);
  bool stop = false;
  while (!stop && rows.step()) {
    if (!rows.bytes(0).starts_with(selection.prefix)) break;
    readRow(rows, reader, rowHandler, tell, stop);
  }
}

void SqliteHistory::readRow(SqliteStatement& row, ChunkReader& reader,
                            const CountedRowHandler& rowHandler, const FailureHandler& tell,
                            bool& stop) const {
  const std::string_view key = row.bytes(0);
  const auto day = static_cast<std::int32_t>(row.integer(1));
  ChunkEnumerator values(row, version_, reader);
  rowHandler(key, day, row.integer(2), values, stop);
  if (!values.failure()) return;
  if (values.failure()->fault == StoreFault::Damaged) throw *values.failure();
  tell(inDistribution(key, day, *values.failure()));
}

void SqliteHistory::report(const StoreFailure& failure) {
  std::optional<StoreFailure> unlogged = failure;
  if (failure.fault == StoreFault::Damaged && !store_->lockless) {
    store_.reset();
    setIncomplete();
    unlogged = site_.setAside(identity_, failure);
  }
  if (unlogged) site_.logFailure(*unlogged);
}

}  // namespace tavrel
