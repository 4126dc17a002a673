#include "fleet/engine/clickhouse/clickhouse_reading.h"

#include <algorithm>
#include <optional>
#include <string>

#include "fleet/engine/clickhouse/row_binary.h"

namespace tavrel::fleet {
namespace {

// Far more than the texts of a row have together.
constexpr std::size_t kLargestRow = 1U << 20;

// Rows of fixed or varying size from pieces of an answer. `parse` is false when bytes of the row
// are still to come.
template <class Row, class Parse>
void readRows(Server& server, const std::string& statement, const Visitor<Row>& visit,
              const Parse& parse) {
  std::string rest;
  std::vector<Row> rows;
  server.ask(statement + " FORMAT RowBinary", [&](std::string_view piece) {
    std::string joined;
    if (!rest.empty()) {
      joined = rest.append(piece);
      rest.clear();
      piece = joined;
    }
    RowReader reader(piece);
    std::size_t left = reader.left();
    for (Row row; parse(reader, row); left = reader.left())
      rows.push_back(row);
    if (!rows.empty()) visit(rows);
    rows.clear();
    if (left > kLargestRow) {
      throw EngineError(server.address().name + ": a row has more than " +
                        std::to_string(kLargestRow) +
                        " bytes: the tables are not those of this program; check the address");
    }
    rest = piece.substr(piece.size() - left);
  });
  if (!rest.empty())
    throw EngineError(server.address().name + ": the answer is incomplete; ask again");
}

std::string whereKey(std::string_view key) {
  return " WHERE key = " + quoted(key);
}

}  // namespace

void ClickhouseReading::logs(std::int32_t firstDay, std::int32_t lastDay,
                             const Visitor<LogRow>& visit) {
  const std::string days =
      "day BETWEEN " + std::to_string(firstDay) + " AND " + std::to_string(lastDay);
  readRows<LogRow>(
      server_,
      "SELECT log, day, created, os_version, previous_os_version, config_number, "
      "whitelist_digest, task_id, language, preferred_language, region FROM log WHERE " +
          days + " AND log GLOBAL IN (SELECT min(log) FROM log GROUP BY digest)",
      visit, [](RowReader& reader, LogRow& row) {
        return reader.getAll(row.log, row.day, row.created, row.osVersion, row.previousOsVersion,
                             row.configNumber, row.whitelistDigest, row.taskID, row.language,
                             row.preferredLanguage, row.region);
      });
}

std::vector<Key> ClickhouseReading::keys() {
  std::vector<Key> keys;
  struct KeyRow {
    std::uint8_t kind = 0;
    std::string_view name;
  };
  readRows<KeyRow>(
      server_, "SELECT DISTINCT kind, name FROM key ORDER BY kind, name",
      [&](std::span<const KeyRow> rows) {
        for (const KeyRow& row : rows)
          keys.push_back({std::string(row.name), static_cast<KeyKind>(row.kind)});
      },
      [](RowReader& reader, KeyRow& row) { return reader.getAll(row.kind, row.name); });
  return keys;
}

void ClickhouseReading::scalars(std::string_view key, const Visitor<ScalarValue>& visit) {
  readRows<ScalarValue>(
      server_, "SELECT log, value FROM scalar" + whereKey(key), visit,
      [](RowReader& reader, ScalarValue& row) { return reader.getAll(row.log, row.value); });
}

void ClickhouseReading::distributions(std::string_view key,
                                      const Visitor<DistributionValue>& visit) {
  readRows<DistributionValue>(
      server_,
      "SELECT log, minimum, maximum, mean, squared_deviations, count FROM distribution" +
          whereKey(key),
      visit, [](RowReader& reader, DistributionValue& row) {
        FiveNumbers& five = row.numbers;
        return reader.getAll(row.log, five.minimum, five.maximum, five.mean, five.squaredDeviations,
                             five.count);
      });
}

void ClickhouseReading::cells(std::string_view key, const Visitor<CellValue>& visit) {
  readRows<CellValue>(server_, "SELECT log, lower, upper, count FROM cell" + whereKey(key), visit,
                      [](RowReader& reader, CellValue& row) {
                        return reader.getAll(row.log, row.lower, row.upper, row.count);
                      });
}

}  // namespace tavrel::fleet
