#include "tools/nand/nand_statistics.h"

#include <algorithm>
#include <nlohmann/json.hpp>
#include <ostream>
#include <utility>

#include "base/format.h"
#include "base/text.h"
#include "storage/parse/statistic_keys.h"
#include "tools/console/json_list.h"
#include "tools/console/table.h"

namespace tavrel {
namespace {

constexpr std::size_t kUnitBytes = 8;
constexpr std::uint32_t kLargestValidKey = 0x30000000;

struct Record {
  std::uint32_t key;
  ByteSpan values;  // whole units
  const StatisticKey* statistic;

  std::size_t count() const { return values.size() / kUnitBytes; }
  std::uint64_t value(std::size_t i) const { return *loadLittle64(values, i * kUnitBytes); }
  /// Whether the parser lists the whole record: under its name, one value per entry.
  bool isListed() const { return statistic && count() > 0 && count() <= statistic->cap; }
};

// Walks the records up to the first broken one, and returns what is wrong with that one.
template <class Visit>
std::optional<std::string> forEachRecord(ByteSpan buffer, Visit visit) {
  const std::uint64_t end = buffer.size() / kUnitBytes * kUnitBytes;
  if (end == 0) return format("it has %zu bytes, and a record has at least 8", buffer.size());
  for (std::uint64_t at = 0; at < end;) {
    const std::uint32_t key = *loadLittle32(buffer, at), count = *loadLittle32(buffer, at + 4);
    if (key > kLargestValidKey) {
      return format(
          "the record at byte %llu: 0x%x is above 0x30000000, the largest number of a "
          "statistic",
          at, key);
    }
    at += kUnitBytes;
    const std::uint64_t left = (end - at) / kUnitBytes;
    if (count > left) {
      return format("the record at byte %llu: statistic %u has %s, but there is room for %llu",
                    at - kUnitBytes, key, counted(count, "value"), left);
    }
    visit(Record{key, *slice(buffer, at, count * kUnitBytes), findStatisticKey(key)});
    at += count * kUnitBytes;
  }
  return std::nullopt;
}

// The form that `nand build` reads. A record that the parser does not list becomes an entry of its
// own, so that nothing is lost.
void addEntries(JsonList& entries, const Record& record) {
  if (!record.isListed()) {
    // A record may fill the whole buffer; written as text, it needs memory only for its digits.
    const Json key = record.statistic ? Json(record.statistic->name) : Json(record.key);
    std::string text = format("{\"key\": %s, \"values\": [", key.dump());
    for (std::size_t i = 0; i < record.count(); ++i)
      appendFormat(text, "%s%llu", i > 0 ? ", " : "", record.value(i));
    return entries.addText(text + "]}");
  }
  const std::string name(record.statistic->name);
  if (record.count() == 1) return entries.add(Json::array({name, record.value(0)}));
  for (std::size_t i = 0; i < record.count(); ++i)
    entries.add(Json::array({name + std::to_string(i), record.value(i)}));
}

struct Row {
  std::string_view name;
  std::uint64_t value;
  std::size_t position;  // in the buffer
};

// By name; entries of the same name keep the order of the buffer.
std::vector<Row> sortedRows(const ASPContext& context) {
  std::vector<Row> rows;
  forEachStatistic(context, [&](std::string_view name, const ASPValueEntry& entry) {
    rows.push_back({name, entry.value, rows.size()});
  });
  std::sort(rows.begin(), rows.end(), [](const Row& a, const Row& b) {
    return std::tie(a.name, a.position) < std::tie(b.name, b.position);
  });
  return rows;
}

std::string changeText(const StatisticDifference& difference) {
  if (!difference.before || !difference.after) return {};
  const std::uint64_t before = *difference.before, after = *difference.after;
  return after > before ? format("+%llu", after - before) : format("-%llu", before - after);
}

Json jsonOfChange(const StatisticDifference& difference) {
  if (!difference.before || !difference.after) return nullptr;
  const auto change = static_cast<std::int64_t>(*difference.after - *difference.before);
  if ((change > 0) != (*difference.after > *difference.before)) return nullptr;
  return change;
}

Json jsonOfValue(const std::optional<std::uint64_t>& value) {
  return value ? Json(*value) : Json(nullptr);
}

std::string valueText(const std::optional<std::uint64_t>& value) {
  return value ? std::to_string(*value) : "-";
}

}  // namespace

void printStatisticsJson(std::ostream& out, int result, const ASPContext& context,
                         ByteSpan buffer) {
  JsonList entries(out,
                   {{"result", result},
                    {"fields",
                     {{"exportVersion", context.exportVersion},
                      {"driverVersion", context.driverVersion},
                      {"numVirtualBlocks", context.numVirtualBlocks},
                      {"blocksPerVirtualBlock", context.blocksPerVirtualBlock},
                      {"pagesPerVirtualBlock", context.pagesPerVirtualBlock},
                      {"bytesPerPage", context.bytesPerPage},
                      {"hostReads", context.hostReads},
                      {"hostWrites", context.hostWrites},
                      {"numFreeVirtualBlocks", context.numFreeVirtualBlocks},
                      {"wearLevMoves", context.wearLevMoves},
                      {"nandReads", context.nandReads},
                      {"nandWrites", context.nandWrites},
                      {"bandErases", context.bandErases},
                      {"IND_pool_free", context.IND_pool_free},
                      {"IND_pool_count", context.IND_pool_count},
                      {"utilFormatTime", context.utilFormatTime},
                      {"numSleepOps", context.numSleepOps},
                      {"maxHighEnduranceBlockErases", context.maxHighEnduranceBlockErases},
                      {"readCountHisto", context.readCountHisto}}}},
                   "entries");
  forEachRecord(buffer, [&](const Record& record) { addEntries(entries, record); });
  if (const ByteSpan rest = buffer.subspan(buffer.size() / kUnitBytes * kUnitBytes);
      result == 1 && !rest.empty()) {
    std::string hex;
    appendHex(hex, rest);
    entries.add({{"hex", std::move(hex)}});
  }
  entries.end();
}

std::size_t printStatistics(const Page& page, const ASPContext& context, ByteSpan buffer) {
  Table table({{"STATISTIC", Table::Align::Whole}, {"VALUE", Table::Align::Right}});
  forEachStatistic(context, [&](std::string_view name, const ASPValueEntry& entry) {
    table.add({std::string(name), std::string(asText(entry.text))});
  });
  if (table.empty()) {
    page.out << "no named statistics\n";
  } else {
    table.print(page);
  }
  std::size_t unlisted = 0;
  forEachRecord(buffer, [&](const Record& record) { unlisted += record.isListed() ? 0U : 1U; });
  return unlisted;
}

std::optional<std::string> faultOfStatistics(ByteSpan buffer) {
  return forEachRecord(buffer, [](const Record&) {});
}

std::vector<StatisticDifference> differencesBetween(const ASPContext& before,
                                                    const ASPContext& after) {
  const std::vector<Row> first = sortedRows(before), second = sortedRows(after);
  std::vector<std::pair<std::size_t, StatisticDifference>> found;
  auto a = first.begin(), b = second.begin();
  while (a != first.end() || b != second.end()) {
    int order = 1;
    if (b == second.end()) {
      order = -1;
    } else if (a != first.end()) {
      order = a->name.compare(b->name);
    }
    if (order < 0) {
      found.push_back({a->position, {a->name, a->value, std::nullopt}});
    } else if (order > 0) {
      found.push_back({first.size() + b->position, {b->name, std::nullopt, b->value}});
    } else if (a->value != b->value) {
      found.push_back({a->position, {a->name, a->value, b->value}});
    }
    if (order <= 0) ++a;
    if (order >= 0) ++b;
  }
  std::sort(found.begin(), found.end(),
            [](const auto& x, const auto& y) { return x.first < y.first; });
  std::vector<StatisticDifference> differences;
  differences.reserve(found.size());
  for (const auto& [position, difference] : found)
    differences.push_back(difference);
  return differences;
}

Json jsonOfDifferences(const std::vector<StatisticDifference>& differences) {
  Json list = Json::array();
  for (const StatisticDifference& difference : differences) {
    list.push_back({{"statistic", difference.name},
                    {"before", jsonOfValue(difference.before)},
                    {"after", jsonOfValue(difference.after)},
                    {"change", jsonOfChange(difference)}});
  }
  return list;
}

void printDifferences(const Page& page, const std::vector<StatisticDifference>& differences) {
  constexpr auto kRight = Table::Align::Right;
  Table table({{"STATISTIC", Table::Align::Whole},
               {"BEFORE", kRight},
               {"AFTER", kRight},
               {"CHANGE", kRight}});
  for (const StatisticDifference& difference : differences) {
    table.add({std::string(difference.name), valueText(difference.before),
               valueText(difference.after), changeText(difference)});
  }
  if (table.empty()) {
    page.out << "no differences among named statistics\n";
  } else {
    table.print(page);
  }
}

}  // namespace tavrel
