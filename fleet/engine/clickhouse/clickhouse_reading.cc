#include "fleet/engine/clickhouse/clickhouse_reading.h"

#include <algorithm>
#include <array>
#include <span>
#include <string>
#include <type_traits>

#include "fleet/engine/clickhouse/native_block.h"

namespace tavrel::fleet {
namespace {

constexpr std::size_t kRowsAtOnce = 1024;

// Servers send blocks of 65,536 rows, and a row with texts takes some 200 bytes.
constexpr std::size_t kLargestBlock = 256U << 20;

// Hands out the rows of a block. A field selects the member of a row that a column's value fills.
template <class Row, class... Fields>
void visitBlock(NativeBlock& block, const Visitor<Row>& visit, const Fields&... fields) {
  std::array<Row, kRowsAtOnce> rows;
  for (std::size_t left = block.rows(); left != 0;) {
    const std::span<Row> some(rows.data(), std::min(left, rows.size()));
    std::size_t column = 0;
    (block.fill(column++, some, fields), ...);
    visit(some);
    left -= some.size();
  }
}

template <class Row, class... Fields>
void readRows(Server& server, std::string& bytes, const std::string& statement,
              const Visitor<Row>& visit, const Fields&... fields) {
  constexpr std::array kTypes = {
      columnTypeOf<std::remove_reference_t<std::invoke_result_t<Fields, Row&>>>()...};
  bytes.clear();
  std::size_t enough = 1;  // how many bytes make another search worthwhile
  bool isDone = false;     // the visitor needs no more rows
  NativeBlock block;
  const auto takeBlocks = [&] {
    std::size_t taken = 0;
    while (taken < bytes.size()) {
      const NativeBlock::Found found = block.find(std::string_view(bytes).substr(taken), kTypes);
      if (found == NativeBlock::Found::Other) {
        throw EngineError(server.address().name +
                          ": the answer does not have the requested form; check that this program "
                          "made the tables, and try again");
      }
      if (found == NativeBlock::Found::Part) break;
      try {
        visitBlock<Row>(block, visit, fields...);
      } catch (const EnoughRows&) {
        isDone = true;
        return bytes.clear();
      }
      taken += block.size();
    }
    bytes.erase(0, taken);
    if (bytes.size() > kLargestBlock) {
      throw EngineError(server.address().name +
                        ": a block of rows has more than 256 MiB: the tables are not those of this "
                        "program; check the address");
    }
    // Wait until the bytes have doubled: searching a partial block too often would be slow.
    enough = 2 * bytes.size() + 1;
  };
  server.ask(statement + " FORMAT Native", [&](std::string_view piece) {
    // A server whose answer is not received to its end logs that as a failure of its own.
    if (isDone) return;
    bytes += piece;
    if (bytes.size() >= enough) takeBlocks();
  });
  takeBlocks();
  if (!bytes.empty())
    throw EngineError(server.address().name + ": the answer is incomplete; try again");
}

std::string whereKey(std::string_view key) {
  return " WHERE key = " + quoted(key);
}

}  // namespace

void ClickhouseReading::logs(std::int32_t firstDay, std::int32_t lastDay,
                             const Visitor<LogRow>& visit) {
  const std::string days =
      "day BETWEEN " + std::to_string(firstDay) + " AND " + std::to_string(lastDay);
  readRows<LogRow>(server_, bytes_,
                   "SELECT log, day, os_version, whitelist_digest, region FROM log WHERE " + days +
                       " AND log GLOBAL IN (SELECT min(log) FROM log GROUP BY digest)",
                   visit, &LogRow::log, &LogRow::day, &LogRow::osVersion, &LogRow::whitelistDigest,
                   &LogRow::region);
}

std::vector<Key> ClickhouseReading::keys() {
  std::vector<Key> keys;
  struct KeyRow {
    std::uint8_t kind = 0;
    std::string_view name;
  };
  readRows<KeyRow>(
      server_, bytes_, "SELECT DISTINCT kind, name FROM key ORDER BY kind, name",
      [&](std::span<const KeyRow> rows) {
        for (const KeyRow& row : rows) {
          // Another program may have filed other kinds.
          if (row.kind > static_cast<std::uint8_t>(KeyKind::Histogram)) continue;
          keys.push_back({std::string(row.name), static_cast<KeyKind>(row.kind)});
        }
      },
      &KeyRow::kind, &KeyRow::name);
  return keys;
}

void ClickhouseReading::scalars(std::string_view key, const Visitor<ScalarValue>& visit) {
  readRows<ScalarValue>(server_, bytes_, "SELECT log, value FROM scalar" + whereKey(key), visit,
                        &ScalarValue::log, &ScalarValue::value);
}

void ClickhouseReading::distributions(std::string_view key,
                                      const Visitor<DistributionValue>& visit) {
  readRows<DistributionValue>(
      server_, bytes_,
      "SELECT log, minimum, maximum, mean, squared_deviations, count FROM distribution" +
          whereKey(key),
      visit, &DistributionValue::log,
      [](DistributionValue & row) -> auto& { return row.numbers.minimum; },
      [](DistributionValue & row) -> auto& { return row.numbers.maximum; },
      [](DistributionValue & row) -> auto& { return row.numbers.mean; },
      [](DistributionValue & row) -> auto& { return row.numbers.squaredDeviations; },
      [](DistributionValue & row) -> auto& { return row.numbers.count; });
}

void ClickhouseReading::cells(std::string_view key, const Visitor<CellValue>& visit) {
  readRows<CellValue>(server_, bytes_, "SELECT log, lower, upper, count FROM cell" + whereKey(key),
                      visit, &CellValue::log, &CellValue::lower, &CellValue::upper,
                      &CellValue::count);
}

}  // namespace tavrel::fleet
