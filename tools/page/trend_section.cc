// Statistics over days.
#include <algorithm>
#include <cmath>
#include <set>

#include "base/format.h"
#include "catalogue/catalogue.h"
#include "page/charts.h"
#include "page/number_text.h"
#include "page/table.h"
#include "tools/console/day_argument.h"
#include "tools/console/table.h"
#include "tools/page/sections.h"

namespace tavrel {
namespace {

using Values = std::vector<std::optional<double>>;

constexpr SectionLimit kChartLimit{120, 600'000};
// For trends beyond that, which are rows of a table.
constexpr SectionLimit kRowLimit{500, 800'000};

/// A statistic over the days of the page: a scalar or a distribution.
struct Trend {
  std::string_view key;
  const RecordedScalar* scalar = nullptr;
  const RecordedDistribution* distribution = nullptr;
};

// Statistics that are in the log come first.
std::vector<Trend> trendsOf(const PageScene& scene) {
  std::set<std::string_view> inLog;
  for (const DistributionView& view : scene.log.distributions)
    inLog.insert(view.key);
  std::vector<Trend> trends;
  for (const auto& [key, scalar] : scene.recorded.scalars)
    trends.push_back({key, &scalar, nullptr});
  for (const auto& [key, distribution] : scene.recorded.distributions)
    trends.push_back({key, nullptr, &distribution});
  std::ranges::stable_sort(trends, {}, [&](const Trend& trend) {
    const bool leaves = trend.scalar != nullptr ? !scene.log.scalars.get(trend.key).isNull()
                                                : inLog.contains(trend.key);
    return std::pair(!leaves, trend.key);
  });
  return trends;
}

template <class Value, class Figure>
Values overDays(const RecordedDays& recorded, const ByDay<Value>& days, const Figure& figure) {
  Values values(static_cast<std::size_t>(std::int64_t{recorded.last} - recorded.first + 1));
  for (const auto& [day, value] : days) {
    const double number = figure(value);
    if (std::isfinite(number))
      values[static_cast<std::size_t>(std::int64_t{day} - recorded.first)] = number;
  }
  return values;
}

// A mean, minimum or maximum.
Values figureOverDays(const RecordedDays& recorded, const ByDay<Summary>& days,
                      double (Summary::*figure)() const) {
  return overDays(recorded, days, [figure](const Summary& summary) {
    return summary.numbers() > 0 ? (summary.*figure)() : std::nan("");
  });
}

// For a distribution, its means.
Values valuesOf(const RecordedDays& recorded, const Trend& trend) {
  if (trend.distribution != nullptr)
    return figureOverDays(recorded, trend.distribution->days, &Summary::mean);
  return overDays(recorded, trend.scalar->days,
                  [](std::int64_t value) { return static_cast<double>(value); });
}

void writeChart(const PageScene& scene, page::HtmlWriter& html, const Trend& trend) {
  const std::string_view unit = catalogue::unitOf(trend.key);
  beginCard(html, trend.key);
  writeKey(html, trend.key);
  html.end();
  const RecordedDays& recorded = scene.recorded;
  page::LineChart chart{std::string(trend.key),
                        valuesOf(recorded, trend),
                        {},
                        {},
                        dayDateText(recorded.first),
                        dayDateText(recorded.last),
                        [unit](double value) { return page::figureText(value, unit); }};
  if (trend.distribution != nullptr) {
    chart.lows = figureOverDays(recorded, trend.distribution->days, &Summary::minimum);
    chart.highs = figureOverDays(recorded, trend.distribution->days, &Summary::maximum);
  }
  writeLineChart(html, chart);
  html.end();
}

void writeRow(const RecordedDays& recorded, page::Table& table, const Trend& trend) {
  const std::string_view unit = catalogue::unitOf(trend.key);
  std::size_t known = 0;
  double low = 0, high = 0, last = 0;
  for (const auto& value : valuesOf(recorded, trend)) {
    if (!value) continue;
    low = known == 0 ? *value : std::min(low, *value);
    high = known == 0 ? *value : std::max(high, *value);
    last = *value;
    ++known;
  }
  table.row();
  table.cell([&](page::HtmlWriter& cell) { writeKey(cell, trend.key); });
  table.cell(std::to_string(known));
  for (const double value : {low, high, last})
    table.cell(known == 0 ? "none" : page::figureText(value, unit));
}

}  // namespace

void writeTrends(PageScene& scene) {
  const RecordedDays& recorded = scene.recorded;
  const auto days = static_cast<std::uint64_t>(std::int64_t{recorded.last} - recorded.first + 1);
  page::HtmlWriter& html = scene.document.section(format("Trends over %s", counted(days, "day")));
  const std::vector<Trend> trends = trendsOf(scene);
  if (trends.empty()) {
    html.element("p", recorded.fault.empty() ? "The device recorded nothing on these days."
                                             : format("Not known: %s", recorded.fault));
    return;
  }
  html.element(
      "p",
      "Exact figures. A gap is a day on which the device recorded nothing. For a distribution the "
      "line is the mean, and the area reaches from the lowest to the highest value.");
  const std::size_t count = trends.size();
  std::size_t written = 0;
  html.begin("div", {{"class", "cards"}});
  for (; written < count && !kChartLimit.isReached(written, html); ++written)
    writeChart(scene, html, trends[written]);
  html.end();
  if (written == count) return;
  html.element("h3", format("%s more without a chart", counted(count - written, "statistic")));
  constexpr auto kNumber = page::Table::Align::Number;
  page::Table table(html, "Statistics without a chart",
                    {{"Statistic", page::Table::Align::Name},
                     {"Days", kNumber},
                     {"Lowest", kNumber},
                     {"Highest", kNumber},
                     {"Last", kNumber}});
  const std::size_t charts = written;
  for (; written < count && !kRowLimit.isReached(written - charts, html); ++written)
    writeRow(recorded, table, trends[written]);
  table.end();
  writeLeftOut(html, count - written, "statistic", "tavrelctl stat list");
}

}  // namespace tavrel
