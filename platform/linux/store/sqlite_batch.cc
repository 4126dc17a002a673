#include "platform/linux/store/sqlite_batch.h"

#include <algorithm>
#include <utility>

#include "base/limits.h"
#include "base/text.h"
#include "platform/linux/store/distribution_writer.h"
#include "platform/linux/store/sqlite_log_file.h"
#include "platform/linux/store/sqlite_schema.h"
#include "platform/linux/store/sqlite_trim.h"

namespace tavrel {
namespace {

// Bytes of waiting rows, of either kind, above which they are written. They are written in key
// order: the more rows at once, the fewer pages are written twice.
constexpr std::size_t kPendingBytes = 16U << 20;

void checkKey(std::string_view key) {
  if (key.size() <= limits::kStoreKeyBytes) return;
  throw StoreFailure{StoreFault::Other, "a key of " + std::to_string(key.size()) +
                                            " bytes is refused: the longest allowed has " +
                                            std::to_string(limits::kStoreKeyBytes)};
}

}  // namespace

struct SqliteBatch::Statements {
  explicit Statements(SqliteConnection& connection)
      : setScalar(connection,
                  "INSERT OR REPLACE INTO scalars (day, key, value) VALUES (?1, ?2, ?3)"),
        getScalar(connection, "SELECT value FROM scalars WHERE day = ?1 AND key = ?2"),
        distributions(connection) {}

  SqliteStatement setScalar;
  SqliteStatement getScalar;
  DistributionWriter distributions;
};

SqliteBatch::SqliteBatch(SqliteConnection connection, const StoreSite& site,
                         std::optional<FileIdentity> file)
    : connection_(std::move(connection)), site_(site), file_(file), kept_(site.path) {
  // A small cache is enough: rows are written in key order, so few pages are changed repeatedly.
  connection_.execute("PRAGMA cache_size = -2048");
}

void SqliteBatch::begin() {
  if (begun_) return;
  connection_.execute("BEGIN IMMEDIATE");
  if (schemaVersion(connection_) == kFirstSchemaVersion) {
    migrate(connection_);
    connection_.execute("BEGIN IMMEDIATE");
  }
  begun_ = true;
  statements_ = std::make_unique<Statements>(connection_);
  if (kept_.exist()) takeKeptValues();
}

void SqliteBatch::takeKeptValues() {
  const auto read = kept_.read();
  if (!read) return site_.log.write(LogLevel::Error, read.error().message);
  if (!*read) return setDamagedValuesAside();
  const auto& values = *read;
  if (values->empty()) return;
  const auto taken = static_cast<std::uint32_t>(connection_.integer("PRAGMA application_id"));
  const auto last = std::find_if(values->rbegin(), values->rend(),
                                 [taken](const KeptValue& value) { return value.number == taken; });
  for (auto value = last.base(); value != values->end(); ++value)
    writeScalar(value->day, value->key, value->value);
  takenNumber_ = values->back().number;
  const std::string number = std::to_string(static_cast<std::int32_t>(*takenNumber_));
  connection_.execute(("PRAGMA application_id = " + number).c_str());
}

// Checks again under the lock, since another process may have replaced the file in the meantime.
void SqliteBatch::setDamagedValuesAside() {
  try {
    const StoreFolderLock lock(site_.path, *site_.busy);
    const std::string line = kept_.setAsideIfDamaged();
    if (!line.empty()) site_.log.write(LogLevel::Error, line);
  } catch (const StoreFailure& failure) {
    site_.logFailure(failure, "; the values kept beside the store are damaged and stay");
  }
}

// Values that others have kept in the meantime stay, and so does the file if it cannot be removed
// now: their numbers show the next batch which values to take in.
void SqliteBatch::removeTakenValues() {
  try {
    const StoreFolderLock lock(site_.path, *site_.busy);
    const auto values = kept_.read();
    if (!values || !*values || (*values)->empty()) return;
    if ((*values)->back().number == takenNumber_) kept_.remove();
  } catch (const StoreFailure&) {
  }
}

// Closing the connection rolls an unfinished transaction back.
SqliteBatch::~SqliteBatch() = default;

template <class Operation>
std::invoke_result_t<Operation> SqliteBatch::attempt(Operation operation) {
  try {
    return operation();
  } catch (const StoreFailure& failure) {
    if (failure.fault == StoreFault::Damaged) damage_ = {file_, failure};
    return Error{site_.describe(failure)};
  }
}

void SqliteBatch::putScalar(std::int32_t day, std::string_view key, std::int64_t value) {
  checkKey(key);
  scalars_.push_back({day, static_cast<std::uint32_t>(key.size()), scalarKeys_.size(), value});
  scalarKeys_ += key;
  if (scalars_.size() * sizeof(PendingScalar) + scalarKeys_.size() >= kPendingBytes) writeScalars();
}

void SqliteBatch::writeScalars() {
  if (scalars_.empty()) return;
  begin();
  const auto keyOf = [this](const PendingScalar& scalar) {
    return std::string_view(scalarKeys_).substr(scalar.keyStart, scalar.keySize);
  };
  // Stable, so that of two values of one key the later one is written last.
  std::stable_sort(scalars_.begin(), scalars_.end(),
                   [&](const PendingScalar& a, const PendingScalar& b) {
                     return a.day != b.day ? a.day < b.day : keyOf(a) < keyOf(b);
                   });
  for (const PendingScalar& scalar : scalars_) {
    writeScalar(scalar.day, keyOf(scalar), scalar.value);
  }
  scalars_.clear();
  scalarKeys_.clear();
}

void SqliteBatch::writeScalar(std::int32_t day, std::string_view key, std::int64_t value) {
  SqliteStatement& statement = statements_->setScalar;
  statement.bind(1, day);
  statement.bind(2, key);
  statement.bind(3, value);
  statement.run();
}

Status SqliteBatch::setScalar(std::int32_t day, std::string_view key, std::int64_t value) {
  return attempt([&]() -> Status {
    putScalar(day, key, value);
    return Done{};
  });
}

std::optional<std::int64_t> SqliteBatch::readScalar(std::int32_t day, std::string_view key) {
  checkKey(key);
  writeScalars();
  begin();
  SqliteStatement& statement = statements_->getScalar;
  statement.bind(1, day);
  statement.bind(2, key);
  std::optional<std::int64_t> value;
  if (statement.step()) value = statement.integer(0);
  statement.reset();
  return value;
}

Expected<std::optional<std::int64_t>> SqliteBatch::scalar(std::int32_t day, std::string_view key) {
  return attempt([&]() -> Expected<std::optional<std::int64_t>> { return readScalar(day, key); });
}

Status SqliteBatch::addScalar(std::int32_t day, std::string_view key, std::int64_t amount) {
  return attempt([&]() -> Status {
    const std::int64_t value = readScalar(day, key).value_or(0);
    std::int64_t sum = 0;
    if (__builtin_add_overflow(value, amount, &sum)) {
      return Error{"adding " + std::to_string(amount) + " to " + std::to_string(value) +
                   " goes beyond 64 bits: set the value instead"};
    }
    writeScalar(day, key, sum);
    return Done{};
  });
}

Status SqliteBatch::appendValue(std::int32_t day, std::string_view key,
                                std::uint32_t secondsInDayOffset, double value) {
  const DistributionSample sample{value, secondsInDayOffset};
  return appendValues(day, key, {&sample, 1});
}

Status SqliteBatch::appendValues(std::int32_t day, std::string_view key,
                                 std::span<const DistributionSample> samples) {
  // In parts, so that a large span does not exceed the bound of waiting values either.
  constexpr std::size_t kAtOnce = kPendingBytes / (kPackedValueBytes + kPackedOffsetBytes);
  return attempt([&]() -> Status {
    checkKey(key);
    while (!samples.empty()) {
      const auto taken = samples.first(std::min(samples.size(), kAtOnce));
      distributions_.append(day, key, taken);
      if (distributions_.bytes() >= kPendingBytes) writeDistributions();
      samples = samples.subspan(taken.size());
    }
    return Done{};
  });
}

Status SqliteBatch::limitWaiting() {
  return attempt([&]() -> Status {
    if (distributions_.bytes() >= kPendingBytes) writeDistributions();
    return Done{};
  });
}

Expected<std::optional<std::string>> SqliteBatch::segmentPosition(std::uint32_t owner,
                                                                  SegmentIdentity identity) {
  return attempt([&]() -> Expected<std::optional<std::string>> {
    begin();
    return segment_table::position(connection_, owner, identity);
  });
}

Expected<std::vector<SegmentName>> SqliteBatch::segmentNames() {
  return attempt([&]() -> Expected<std::vector<SegmentName>> {
    begin();
    return segment_table::names(connection_);
  });
}

Expected<std::int64_t> SqliteBatch::segmentPositionBytes(std::uint32_t owner) {
  return attempt([&]() -> Expected<std::int64_t> {
    begin();
    return segment_table::positionBytes(connection_, owner);
  });
}

Expected<std::int64_t> SqliteBatch::bytesInUse() {
  return attempt([&]() -> Expected<std::int64_t> {
    begin();
    return bytesInUseOf(connection_);
  });
}

Status SqliteBatch::setSegmentPosition(std::uint32_t owner, SegmentIdentity identity,
                                       std::string_view position) {
  return attempt([&]() -> Status {
    begin();
    segment_table::setPosition(connection_, owner, identity, position);
    return Done{};
  });
}

Status SqliteBatch::removeSegmentPosition(std::uint32_t owner, SegmentIdentity identity) {
  return attempt([&]() -> Status {
    begin();
    segment_table::removePosition(connection_, owner, identity);
    return Done{};
  });
}

void SqliteBatch::writeDistributions() {
  if (distributions_.empty()) return;
  begin();
  // In the order in which a day is read, so that reads move forward through the file.
  distributions_.each(
      [this](std::int32_t day, std::string_view key, const DistributionBlock& added) {
        try {
          statements_->distributions.append(day, key, added);
        } catch (const RowFailure& failure) {
          if (!refuses_) throw;
          if (refused_ == 0) {
            site_.logFailure(failure, "; what was recorded for " + quotedText(key.substr(0, 80)) +
                                          " on day " + std::to_string(day) + " is refused");
          }
          refused_ += added.values.size() / kPackedValueBytes;
        }
      });
  distributions_.clear();
}

Expected<std::uint64_t> SqliteBatch::refusedValues() {
  return attempt([&]() -> Expected<std::uint64_t> {
    writeDistributions();
    return refused_;
  });
}

void SqliteBatch::finish() {
  if (kept_.exist()) begin();
  writeScalars();
  writeDistributions();
  if (!begun_) return;
  connection_.execute("COMMIT");
  if (takenNumber_) removeTakenValues();
  limitLog();
}

SqliteConnection SqliteBatch::release() {
  statements_.reset();
  return std::move(connection_);
}

// The changes are already durable, so a failure here only leaves the log longer.
void SqliteBatch::limitLog() {
  const auto log = FileSystem::status(site_.path + "-wal");
  // A shorter file may be an emptied log, kept for the next commits.
  if (!log || log->st_size <= kKeptLogBytes) return;
  try {
    connection_.checkpoint(false);
  } catch (const StoreFailure& failure) {
    site_.logFailure(failure, "; the write-ahead log stays as it is");
  }
}

Status SqliteBatch::commit() {
  return attempt([&]() -> Status {
    finish();
    return Done{};
  });
}

}  // namespace tavrel
