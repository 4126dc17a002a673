#include "fleet/engine/clickhouse/clickhouse_appending.h"

#include <algorithm>
#include <unordered_set>

#include "base/ascii.h"
#include "fleet/engine/clickhouse/clickhouse_reading.h"
#include "fleet/engine/clickhouse/row_binary.h"

namespace tavrel::fleet {
namespace {

// Limits of a portion, which occupies memory here and, as blocks, on the server.
constexpr std::size_t kLogsInPortion = 4096;
constexpr std::size_t kRowsInPortion = 1'000'000;

// By default a statement may have 256 KiB.
constexpr std::size_t kDigestsAtOnce = 1000;

std::string_view bytesOf(const LogRecord& record) {
  return {reinterpret_cast<const char*>(record.digest.data()), record.digest.size()};
}

std::size_t rowsOf(const LogRecord& record) {
  return record.scalars.size() + record.distributions.size() + record.cells.size() +
         record.applications.size();
}

std::string literalOf(std::string_view bytes) {
  std::string out = "'";
  for (const char byte : bytes) {
    out += "\\x";
    appendHexByte(out, byte);
  }
  return out + "'";
}

}  // namespace

Engine::Appended ClickhouseAppending::append(std::span<const LogRecord> records) {
  if (!keysAreRead_) readKeys();
  const Records fresh = unknownOf(records);
  for (std::size_t begin = 0, end = 0; begin < fresh.size(); begin = end) {
    for (std::size_t rows = 0; end < fresh.size() && end - begin < kLogsInPortion; ++end) {
      rows += rowsOf(*fresh[end]);
      if (rows > kRowsInPortion && end > begin) break;
    }
    insertPortion(std::span(fresh).subspan(begin, end - begin));
  }
  Engine::Appended result{fresh.size(), records.size() - fresh.size(),
                          std::vector<bool>(records.size())};
  for (const LogRecord* record : fresh)
    result.isNew[static_cast<std::size_t>(record - records.data())] = true;
  return result;
}

void ClickhouseAppending::readKeys() {
  for (Key& key : ClickhouseReading(server_).keys())
    keys_[static_cast<std::size_t>(key.kind)].insert(std::move(key.name));
  keysAreRead_ = true;
}

ClickhouseAppending::Records ClickhouseAppending::unknownOf(std::span<const LogRecord> records) {
  std::unordered_set<std::string> known;
  for (std::size_t begin = 0; begin < records.size(); begin += kDigestsAtOnce) {
    std::string statement = "SELECT digest FROM log WHERE digest IN (";
    for (const LogRecord& record :
         records.subspan(begin, std::min(kDigestsAtOnce, records.size() - begin)))
      statement += literalOf(bytesOf(record)) + ",";
    statement.back() = ')';
    const std::string answer = server_.ask(statement + " FORMAT RowBinary");
    for (std::size_t at = 0; at + 32 <= answer.size(); at += 32)
      known.insert(answer.substr(at, 32));
  }
  Records fresh;
  for (const LogRecord& record : records) {
    if (known.insert(std::string(bytesOf(record))).second) fresh.push_back(&record);
  }
  return fresh;
}

void ClickhouseAppending::addKey(KeyKind kind, std::string_view key) {
  auto& known = keys_[static_cast<std::size_t>(kind)];
  if (known.contains(key)) return;
  known.emplace(key);
  putAll(newKeys_, static_cast<std::uint8_t>(kind), key);
}

void ClickhouseAppending::addRows(const LogRecord& record, LogId log) {
  putAll(logs_, log);
  logs_ += bytesOf(record);
  putAll(logs_, record.day, record.created, record.osVersion, record.previousOsVersion,
         record.configNumber, record.whitelistDigest, record.taskID, record.language,
         record.preferredLanguage, record.region);
  for (const ScalarRow& row : record.scalars) {
    addKey(KeyKind::Scalar, row.key);
    putAll(scalars_, row.key, log, row.value);
  }
  for (const auto& [key, five] : record.distributions) {
    addKey(KeyKind::Distribution, key);
    putAll(distributions_, key, log, five.minimum, five.maximum, five.mean, five.squaredDeviations,
           five.count);
  }
  for (const CellRow& row : record.cells) {
    addKey(KeyKind::Histogram, row.key);
    putAll(cells_, row.key, log, row.lower, row.upper, row.label, row.count);
  }
  for (const ApplicationRow& row : record.applications) {
    putAll(activations_, row.bundle, log, row.version, row.uuid, row.orboID, row.arch,
           std::uint64_t{1});
  }
}

void ClickhouseAppending::insertPortion(std::span<const LogRecord* const> records) {
  const auto insert = [this](const char* table, const std::string& rows) {
    if (!rows.empty())
      server_.insert("INSERT INTO " + std::string(table) + " FORMAT RowBinary", rows);
  };
  newKeys_.clear();
  try {
    server_.retry([&] {
      for (std::string* rows : {&logs_, &scalars_, &distributions_, &cells_, &activations_})
        rows->clear();
      LogId log = LogId{random_()} << 32 | random_();
      for (const LogRecord* record : records)
        addRows(*record, log++);
      insert("key", newKeys_);
      insert("scalar", scalars_);
      insert("distribution", distributions_);
      insert("cell", cells_);
      insert("activation", activations_);
      insert("log", logs_);
    });
  } catch (...) {
    keysAreRead_ = false;
    for (auto& keys : keys_)
      keys.clear();
    throw;
  }
}

}  // namespace tavrel::fleet
