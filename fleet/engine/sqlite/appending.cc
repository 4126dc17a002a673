#include "fleet/engine/sqlite/appending.h"

namespace tavrel::fleet {
namespace {

// The next append continues a block with fewer logs. Otherwise loaders that append one log at a
// time would make a block for each, and every reader has to look into every block.
constexpr std::int64_t kFewLogs = 256;

struct RowTable {
  const char* source;
  const char* insertion;
};

constexpr RowTable kScalars = {"pending_scalar",
                               "INSERT INTO scalar(id, value) SELECT id, a FROM pending_scalar"};
constexpr RowTable kDistributions = {
    "pending_distribution",
    "INSERT INTO distribution(id, minimum, maximum, mean, squared_deviations, count) "
    "SELECT id, a, b, c, d, e FROM pending_distribution"};
constexpr RowTable kCells = {"pending_cell",
                             "INSERT INTO cell(id, count) SELECT id, a FROM pending_cell"};
constexpr RowTable kActivations = {
    "pending_activation", "INSERT INTO activation(id, times) SELECT id, a FROM pending_activation"};

constexpr const char* kInsertLog =
    "INSERT INTO log(id, digest, day, created, os_version, previous_os_version, config_number, "
    "whitelist_digest, task_id, language, preferred_language, region) "
    "VALUES(?1, ?2, ?3, ?4, ?5, ?6, ?7, ?8, ?9, ?10, ?11, ?12) ON CONFLICT(digest) DO NOTHING";

}  // namespace

Appending::Appending(Connection& connection)
    : connection_(connection),
      names_(connection),
      insertLog_(connection, kInsertLog),
      insertBlock_(connection, "INSERT INTO block(id, first_log) VALUES(?1, ?2)"),
      lastBlock_(connection, "SELECT id, first_log FROM block ORDER BY id DESC LIMIT 1") {
  addRowTable(connection, kScalars.source, scalars_);
  addRowTable(connection, kDistributions.source, distributions_);
  addRowTable(connection, kCells.source, cells_);
  addRowTable(connection, kActivations.source, activations_);
}

Engine::Appended Appending::append(std::span<const LogRecord> records) {
  Engine::Appended result;
  WriteTransaction transaction(connection_);
  names_.refresh();
  continueLastBlock();
  for (const LogRecord& record : records) {
    result.isNew.push_back(insertLog(record));
    if (!result.isNew.back()) {
      ++result.known;
      continue;
    }
    ++result.added;
    beginBlockWhenFull();
    addRows(record);
    ++log_;
  }
  insertRows();
  transaction.commit();
  return result;
}

void Appending::continueLastBlock() {
  log_ = connection_.integer("SELECT max(id) FROM log") + 1;
  block_ = 0;
  blockEnd_ = log_;
  if (lastBlock_.step()) {
    block_ = lastBlock_.integer(0);
    firstLog_ = lastBlock_.integer(1);
    if (log_ - firstLog_ < kFewLogs) blockEnd_ = firstLog_ + kLogsInBlock;
  }
  lastBlock_.reset();
}

void Appending::beginBlockWhenFull() {
  if (log_ < blockEnd_) return;
  insertRows();
  if (++block_ >= kMaxBlocks)
    throw EngineError(connection_.path() + ": is full: load the logs into a new file");
  firstLog_ = log_;
  blockEnd_ = log_ + kLogsInBlock;
  insertBlock_.bind(1, block_);
  insertBlock_.bind(2, firstLog_);
  insertBlock_.run();
}

void Appending::insertRows() {
  const auto insert = [this](auto& rows, const RowTable& table) {
    if (rows.empty()) return;
    rows.setBlock(block_);
    Statement(connection_, table.insertion).run();
    rows.clear();
  };
  insert(scalars_, kScalars);
  insert(distributions_, kDistributions);
  insert(cells_, kCells);
  insert(activations_, kActivations);
}

bool Appending::insertLog(const LogRecord& record) {
  insertLog_.bind(1, log_);
  insertLog_.bindBlob(2, {reinterpret_cast<const char*>(record.digest.data()), 32});
  insertLog_.bind(3, std::int64_t{record.day});
  insertLog_.bind(4, record.created);
  insertLog_.bind(5, record.osVersion);
  insertLog_.bind(6, record.previousOsVersion);
  insertLog_.bind(7, record.configNumber);
  insertLog_.bind(8, record.whitelistDigest);
  insertLog_.bind(9, record.taskID);
  insertLog_.bind(10, record.language);
  insertLog_.bind(11, record.preferredLanguage);
  insertLog_.bind(12, record.region);
  insertLog_.run();
  return connection_.changes() != 0;
}

void Appending::addRows(const LogRecord& record) {
  const std::int64_t place = log_ - firstLog_;
  for (const ScalarRow& row : record.scalars)
    scalars_.add(names_.key(KeyKind::Scalar, row.key), place, row.value);
  for (const DistributionRow& row : record.distributions)
    distributions_.add(names_.key(KeyKind::Distribution, row.key), place, &row.numbers);
  for (const CellRow& row : record.cells)
    cells_.add(names_.bucket(row), place, static_cast<std::int64_t>(row.count));
  for (const ApplicationRow& row : record.applications) {
    const std::int64_t application = names_.application(row);
    auto* const last = activations_.last(application);
    if (last != nullptr && last->place == place) {
      ++last->payload;
    } else {
      activations_.add(application, place, 1);
    }
  }
}

}  // namespace tavrel::fleet
