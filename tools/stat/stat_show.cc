#include "tools/stat/stat_show.h"

#include <algorithm>
#include <functional>
#include <nlohmann/json.hpp>
#include <ostream>
#include <utility>
#include <vector>

#include "base/format.h"
#include "catalogue/catalogue.h"
#include "platform/platform.h"
#include "tools/console/day_argument.h"
#include "tools/console/json_value.h"
#include "tools/console/table.h"
#include "tools/console/value_text.h"
#include "tools/shared/distribution_view.h"
#include "tools/stat/recorded.h"
#include "tools/stat/value_summary.h"

namespace tavrel {
namespace {

constexpr int kPercents[] = {1, 5, 25, 50, 75, 95, 99};

struct ScalarDay {
  std::int32_t day;
  std::int64_t value;
};
struct DistributionDay {
  std::int32_t day;
  Summary summary;
};

// The data of a key, which may be both a scalar and a distribution.
struct Statistic {
  std::string key;
  std::vector<ScalarDay> scalarDays;
  std::vector<DistributionDay> distributionDays;
  Summary summary;
  std::vector<double> percentiles;
  std::vector<DistributionView::Bucket> buckets;
};

Status forEachValue(RecordedHistory& history,
                    const std::function<void(std::int32_t day, double value)>& take) {
  return history.walkDistributions([&](std::string_view, std::int32_t day, std::int64_t,
                                       BHHistoryDistributionEnumerator& values, bool&) {
    double value = 0;
    std::uint32_t seconds = 0;
    while (values.getNextValue(value, seconds))
      take(day, value);
  });
}

Expected<Statistic> readStatistic(RecordedHistory& history, const std::string& key) {
  Statistic statistic;
  statistic.key = key;
  Status read =
      history.walkScalars([&](std::string_view, std::int32_t day, std::int64_t value, bool&) {
        statistic.scalarDays.push_back({day, value});
      });
  if (!read) return read.error();
  auto& perDay = statistic.distributionDays;
  read = forEachValue(history, [&](std::int32_t day, double value) {
    if (perDay.empty() || perDay.back().day != day) perDay.push_back({day, {}});
    perDay.back().summary.add(value);
    statistic.summary.add(value);
  });
  if (!read) return read.error();
  if (statistic.summary.numbers() == 0) return statistic;

  RoundHistogram histogram(statistic.summary);
  PercentileSearch search(statistic.summary.numbers(), kPercents);
  for (bool isFirstPass = true; search.needsPass(); isFirstPass = false) {
    read = forEachValue(history, [&](std::int32_t, double value) {
      if (isFirstPass) histogram.add(value);
      search.add(value);
    });
    if (!read) return read.error();
    search.endPass();
  }
  statistic.percentiles = search.values();
  statistic.buckets = histogram.buckets();
  return statistic;
}

// "Scalar com.norvane.usage.swap.used_mib, 2 days", plus its meaning if the catalogue has it.
void printTitle(ToolContext& context, const char* kind, const std::string& key, std::size_t days) {
  context.out() << kind << ' ' << printable(key) << ", " << counted(days, "day") << '\n';
  const catalogue::Entry* const entry = catalogue::findStatistic(key);
  if (entry && !entry->meaning.empty()) {
    context.out() << entry->meaning;
    if (!entry->unit.empty()) context.out() << " (" << entry->unit << ')';
    context.out() << '\n';
  }
  context.out() << '\n';
}

// -- JSON ----------------------------------------------------------------------------------------

Json jsonOfDay(std::int32_t day) {
  return {{"day", day}, {"date", dayDateText(day)}};
}

Json jsonOfSummary(const Summary& summary) {
  const auto known = [&](double value) {
    return summary.numbers() == 0 ? Json(nullptr) : jsonOf(plist::Value(value));
  };
  return {{"count", summary.count()},
          {"not_a_number", summary.notNumbers()},
          {"minimum", known(summary.minimum())},
          {"maximum", known(summary.maximum())},
          {"mean", known(summary.mean())},
          {"standard_deviation", known(summary.standardDeviation())}};
}

Json jsonOfScalar(const Statistic& statistic) {
  if (statistic.scalarDays.empty()) return nullptr;
  Json days = Json::array();
  for (const ScalarDay& day : statistic.scalarDays) {
    days.push_back(jsonOfDay(day.day));
    days.back()["value"] = day.value;
  }
  return {{"days", std::move(days)}};
}

Json jsonOfDistribution(const Statistic& statistic) {
  if (statistic.distributionDays.empty()) return nullptr;
  Json distribution = jsonOfSummary(statistic.summary);
  Json percentiles = Json::object();
  for (std::size_t i = 0; i < statistic.percentiles.size(); ++i) {
    percentiles[std::to_string(kPercents[i])] = jsonOf(plist::Value(statistic.percentiles[i]));
  }
  distribution["percentiles"] = std::move(percentiles);
  Json histogram = Json::array();
  for (const auto& bucket : statistic.buckets)
    histogram.push_back({{"bucket", bucket.label}, {"count", bucket.count}});
  distribution["histogram"] = std::move(histogram);
  Json days = Json::array();
  for (const DistributionDay& day : statistic.distributionDays) {
    days.push_back(jsonOfDay(day.day));
    days.back().update(jsonOfSummary(day.summary));
  }
  distribution["days"] = std::move(days);
  return distribution;
}

// -- Text ----------------------------------------------------------------------------------------

constexpr auto kRight = Table::Align::Right;

void printScalar(ToolContext& context, const Statistic& statistic) {
  printTitle(context, "Scalar", statistic.key, statistic.scalarDays.size());
  Table table({{"DAY"}, {"VALUE", kRight}}, 2);
  for (const ScalarDay& day : statistic.scalarDays)
    table.add({dayText(day.day), std::to_string(day.value)});
  table.print(context.page());
}

std::vector<std::string> cellsOf(const Summary& summary) {
  std::vector<std::string> cells{std::to_string(summary.count())};
  for (const double value : {summary.minimum(), summary.maximum(), summary.mean()})
    cells.push_back(summary.numbers() == 0 ? "-" : shortNumber(value));
  return cells;
}

void printDistribution(ToolContext& context, const Statistic& statistic) {
  std::ostream& out = context.out();
  const Page page = context.page();
  const Summary& summary = statistic.summary;
  printTitle(context, "Distribution", statistic.key, statistic.distributionDays.size());
  const std::vector<std::string> cells = cellsOf(summary);
  Table facts({{""}, {"", kRight}}, 2);
  facts.add({"Count", cells[0]});
  if (summary.notNumbers() > 0) facts.add({"Not a number", std::to_string(summary.notNumbers())});
  if (summary.numbers() > 0) {
    facts.add({"Minimum", cells[1]});
    for (std::size_t i = 0; i < statistic.percentiles.size(); ++i) {
      facts.add({format("Percentile %d", kPercents[i]), shortNumber(statistic.percentiles[i])});
    }
    facts.add({"Maximum", cells[2]});
    facts.add({"Mean", cells[3]});
    facts.add({"Standard deviation", shortNumber(summary.standardDeviation())});
  }
  facts.print(page);
  if (!statistic.buckets.empty()) {
    out << "\nHistogram\n";
    printBuckets(page, statistic.buckets);
  }
  out << '\n';
  Table table(
      {{"DAY"}, {"COUNT", kRight}, {"MINIMUM", kRight}, {"MAXIMUM", kRight}, {"MEAN", kRight}}, 2);
  for (const DistributionDay& day : statistic.distributionDays) {
    std::vector<Table::Cell> row{dayText(day.day)};
    for (std::string& cell : cellsOf(day.summary))
      row.emplace_back(std::move(cell));
    table.add(std::move(row));
  }
  table.print(page);
}

}  // namespace

void showStatistic(ToolContext& context, const std::string& key,
                   std::optional<std::uint32_t> days) {
  RowSelection selection{.key = key, .isPrefix = false, .firstDay = kFirstDay, .lastDay = kLastDay};
  if (days) {
    selection.lastDay = context.platform().statistics->BHDaysSince1970();
    selection.firstDay = static_cast<std::int32_t>(
        std::max(std::int64_t{selection.lastDay} - *days + 1, std::int64_t{kFirstDay}));
  }
  auto history = openRecorded(context, std::move(selection));
  if (!history) return context.fail(history.error().message);
  const auto statistic = readStatistic(*history, key);
  if (!statistic) return context.fail(statistic.error().message);
  const bool hasScalar = !statistic->scalarDays.empty();
  const bool hasDistribution = !statistic->distributionDays.empty();
  if (!hasScalar && !hasDistribution) {
    const std::string when = days ? " in the last " + counted(*days, "day") : std::string();
    return context.fail(format("no statistic %s%s: see 'tavrelctl stat list'", key, when));
  }
  if (context.json()) {
    const catalogue::Entry* const entry = catalogue::findStatistic(key);
    const auto known = [&](std::string_view catalogue::Entry::*text) {
      return entry && !(entry->*text).empty() ? Json(entry->*text) : Json(nullptr);
    };
    return context.printJson({{"key", key},
                              {"meaning", known(&catalogue::Entry::meaning)},
                              {"unit", known(&catalogue::Entry::unit)},
                              {"scalar", jsonOfScalar(*statistic)},
                              {"distribution", jsonOfDistribution(*statistic)}});
  }
  if (hasScalar) printScalar(context, *statistic);
  if (hasScalar && hasDistribution) context.out() << '\n';
  if (hasDistribution) printDistribution(context, *statistic);
}

}  // namespace tavrel
