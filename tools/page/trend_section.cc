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

std::size_t indexOf(const RecordedDays& recorded, std::int32_t day) {
  return static_cast<std::size_t>(std::int64_t{day} - recorded.first);
}

void drawScalar(page::LineChart& chart, const RecordedDays& recorded, const Trend& trend) {
  const ByDay<std::int64_t>& days = trend.scalar->days;
  const auto [lowest, highest] =
      std::ranges::minmax_element(days, {}, &ByDay<std::int64_t>::value_type::second);
  const std::int64_t low = lowest->second;
  // Doubles would blur the differences of large integers.
  for (const auto& [day, value] : days) {
    chart.values[indexOf(recorded, day)] =
        static_cast<double>(static_cast<std::uint64_t>(value) - static_cast<std::uint64_t>(low));
  }
  const std::string_view unit = catalogue::unitOf(trend.key);
  chart.lowest = page::figureText(low, unit);
  chart.highest = page::figureText(highest->second, unit);
  chart.latest = page::figureText(days.back().second, unit);
}

// Means, between the extremes of each day. Days without a finite mean are gaps.
void drawDistribution(page::LineChart& chart, const RecordedDays& recorded, const Trend& trend) {
  chart.lows.resize(chart.values.size());
  chart.highs.resize(chart.values.size());
  std::optional<double> low, high;
  double latest = 0;
  for (const auto& [day, summary] : trend.distribution->days) {
    if (summary.numbers() == 0 || !std::isfinite(summary.mean())) continue;
    const std::size_t index = indexOf(recorded, day);
    chart.values[index] = summary.mean();
    chart.lows[index] = summary.minimum();
    chart.highs[index] = summary.maximum();
    low = std::min(low.value_or(summary.minimum()), summary.minimum());
    high = std::max(high.value_or(summary.maximum()), summary.maximum());
    latest = summary.mean();
  }
  if (!low) return;
  const std::string_view unit = catalogue::unitOf(trend.key);
  chart.lowest = page::figureText(*low, unit);
  chart.highest = page::figureText(*high, unit);
  chart.latest = "mean " + page::figureText(latest, unit);
}

page::LineChart chartOf(const RecordedDays& recorded, const Trend& trend) {
  page::LineChart chart;
  chart.name = trend.key;
  chart.values.resize(indexOf(recorded, recorded.last) + 1);
  chart.first = dayDateText(recorded.first);
  chart.last = dayDateText(recorded.last);
  if (trend.scalar != nullptr) {
    drawScalar(chart, recorded, trend);
  } else {
    drawDistribution(chart, recorded, trend);
  }
  return chart;
}

void writeChart(const PageScene& scene, page::HtmlWriter& html, const Trend& trend) {
  beginCard(html, trend.key);
  writeKey(html, trend.key);
  html.end();
  writeLineChart(html, chartOf(scene.recorded, trend));
  html.end();
}

void writeRow(const RecordedDays& recorded, page::Table& table, const Trend& trend) {
  const page::LineChart chart = chartOf(recorded, trend);
  const auto isKnown = [](const std::optional<double>& value) { return value.has_value(); };
  table.row();
  table.cell([&](page::HtmlWriter& cell) { writeKey(cell, trend.key); });
  table.cell(std::to_string(std::ranges::count_if(chart.values, isKnown)));
  for (const std::string& text : {chart.lowest, chart.highest, chart.latest})
    table.cell(text.empty() ? "none" : text);
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
      "Exact figures; labels may be rounded. For a distribution the line is the mean, and the area "
      "reaches from the lowest to the highest value. A gap is a day without a value or without a "
      "finite mean.");
  const std::size_t count = trends.size();
  std::size_t written = 0;
  html.begin("div", {{"class", "cards"}});
  for (; written < count && !kChartLimit.isReached(written, html); ++written)
    writeChart(scene, html, trends[written]);
  html.end();
  if (written == count) return;
  html.element("h3", format("%s without a chart", counted(count - written, "more statistic")));
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
