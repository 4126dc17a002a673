// Records for tests of engines, and everything that an engine hands out, as comparable text.
#pragma once

#include <algorithm>
#include <bit>
#include <cstring>
#include <map>
#include <string>
#include <vector>

#include "fleet/engine/engine.h"

namespace tavrel::fleet {

inline LogRecord makeRecord(std::uint64_t number, std::int32_t day = 20781) {
  LogRecord record;
  std::memcpy(record.digest.data(), &number, sizeof number);
  record.day = day;
  record.created = 1'795'000'000 + static_cast<std::int64_t>(number);
  record.osVersion = "Pellio 4.2 (16R349)";
  record.previousOsVersion = "before";
  record.configNumber = "c";
  record.taskID = "t";
  record.language = "de";
  record.preferredLanguage = "de-AT";
  record.region = record.texts.keep("region " + std::to_string(number));
  return record;
}

/// Logs that have rows in every table; `first` is the number of the first.
inline std::vector<LogRecord> fullRecords(std::uint64_t count, std::uint64_t first = 0) {
  std::vector<LogRecord> records;
  for (std::uint64_t number = first; number < first + count; ++number) {
    LogRecord& record = records.emplace_back(makeRecord(number));
    const auto value = static_cast<std::int64_t>(number);
    record.scalars = {
        {"a", value * 3}, {"b", -value}, {std::string_view("über\n'\"\0\\", 10), INT64_MIN}};
    record.distributions = {{"a", {0.5, 1, 0.75, 0.125, number}}};
    record.cells = {{"a", 0, 1, "(0, 1]", number}, {"a", 1, 2, "(1, 2]", 1}};
    record.applications = {{"com.example", "1", "U", 1, 2}, {"com.example", "1", "U", 1, 2}};
  }
  return records;
}

inline std::string bitsOf(double value) {
  return std::to_string(std::bit_cast<std::uint64_t>(value));
}

/// Each row of a database as a line, sorted as text. A log is named after its region.
inline std::vector<std::string> rowsIn(Engine& engine) {
  std::vector<std::string> lines;
  std::map<LogId, std::string> names;
  engine.logs(INT32_MIN, INT32_MAX, [&](std::span<const LogRow> rows) {
    for (const LogRow& row : rows) {
      const std::string name(row.region);
      names[row.log] = name;
      lines.push_back(name + " " + std::to_string(row.day) + "|" + std::string(row.osVersion) +
                      "|" + std::string(row.whitelistDigest));
    }
  });
  const auto add = [&](LogId log, const std::string& line) {
    if (names.contains(log)) lines.push_back(names[log] + " " + line);
  };
  for (const Key& key : engine.keys()) {
    engine.scalars(key.name, [&](std::span<const ScalarValue> rows) {
      if (key.kind == KeyKind::Scalar)
        for (const ScalarValue& row : rows)
          add(row.log, key.name + "=" + std::to_string(row.value));
    });
    engine.distributions(key.name, [&](std::span<const DistributionValue> rows) {
      if (key.kind == KeyKind::Distribution)
        for (const auto& [log, five] : rows)
          add(log, key.name + ":" + bitsOf(five.minimum) + "," + bitsOf(five.maximum) + "," +
                       bitsOf(five.mean) + "," + bitsOf(five.squaredDeviations) + "," +
                       std::to_string(five.count));
    });
    engine.cells(key.name, [&](std::span<const CellValue> rows) {
      if (key.kind == KeyKind::Histogram)
        for (const auto& [log, lower, upper, count] : rows)
          add(log,
              key.name + "(" + bitsOf(lower) + "," + bitsOf(upper) + "]" + std::to_string(count));
    });
  }
  std::sort(lines.begin(), lines.end());
  return lines;
}

}  // namespace tavrel::fleet
