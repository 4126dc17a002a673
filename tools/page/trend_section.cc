// Statistics over days.
#include <algorithm>
#include <cmath>

#include "base/format.h"
#include "page/charts.h"
#include "page/number_text.h"
#include "page/table.h"
#include "tools/page/sections.h"
#include "tools/shared/day_argument.h"
#include "tools/shared/table.h"

namespace tavrel {
namespace {

using Values = std::vector<std::optional<double>>;

constexpr SectionLimit kChartLimit{120, 600'000};
// Of those beyond, in a table.
constexpr SectionLimit kRowLimit{500, 800'000};

/// A statistic over the days of the page.
struct Trend {
  std::string_view key;
  Values values;  // of a distribution its means
  Values lows, highs;
  bool leaves = false;
};

std::optional<double> finite(double value) {
  return std::isfinite(value) ? std::optional(value) : std::nullopt;
}

class Trends {
 public:
  explicit Trends(const PageScene& scene) : recorded_(scene.recorded) {
    const std::size_t days =
        static_cast<std::size_t>(std::int64_t{recorded_.last} - recorded_.first + 1);
    for (const auto& [key, scalar] : recorded_.scalars) {
      Trend trend{key, Values(days), {}, {}, !scene.log.scalars.get(key).isNull()};
      for (const auto& [day, value] : scalar.days)
        trend.values[place(day)] = static_cast<double>(value);
      trends_.push_back(std::move(trend));
    }
    for (const auto& [key, distribution] : recorded_.distributions) {
      Trend trend{key, Values(days), Values(days), Values(days), false};
      for (const auto& [day, summary] : distribution.days) {
        if (summary.numbers() == 0) continue;
        trend.values[place(day)] = finite(summary.mean());
        trend.lows[place(day)] = finite(summary.minimum());
        trend.highs[place(day)] = finite(summary.maximum());
      }
      trend.leaves = std::ranges::find(scene.log.distributions, key, &DistributionView::key) !=
                     scene.log.distributions.end();
      trends_.push_back(std::move(trend));
    }
    std::ranges::stable_sort(
        trends_, {}, [](const Trend& trend) { return std::pair(!trend.leaves, trend.key); });
  }

  const std::vector<Trend>& all() const { return trends_; }

 private:
  std::size_t place(std::int32_t day) const {
    return static_cast<std::size_t>(std::int64_t{day} - recorded_.first);
  }

  const RecordedDays& recorded_;
  std::vector<Trend> trends_;
};

void writeChart(const PageScene& scene, page::HtmlWriter& html, const Trend& trend) {
  const std::string_view unit = unitOf(trend.key);
  beginCard(html, trend.key);
  writeKey(html, trend.key);
  html.end();
  writeLineChart(html, {std::string(trend.key), trend.values, trend.lows, trend.highs,
                        dayDateText(scene.recorded.first), dayDateText(scene.recorded.last),
                        [unit](double value) { return page::figureText(value, unit); }});
  html.end();
}

void writeRow(page::Table& table, const Trend& trend) {
  const std::string_view unit = unitOf(trend.key);
  std::size_t told = 0;
  double low = 0, high = 0, last = 0;
  for (const auto& value : trend.values) {
    if (!value) continue;
    low = told == 0 ? *value : std::min(low, *value);
    high = told == 0 ? *value : std::max(high, *value);
    last = *value;
    ++told;
  }
  table.row();
  table.cell([&](page::HtmlWriter& cell) { writeKey(cell, trend.key); });
  table.cell(std::to_string(told));
  for (const double value : {low, high, last})
    table.cell(told == 0 ? "none" : page::figureText(value, unit));
}

}  // namespace

void writeTrends(PageScene& scene) {
  const RecordedDays& recorded = scene.recorded;
  const auto days = static_cast<std::uint64_t>(std::int64_t{recorded.last} - recorded.first + 1);
  page::HtmlWriter& html = scene.document.section(format("Trends over %s", counted(days, "day")));
  const Trends trends(scene);
  if (trends.all().empty()) {
    html.element("p", "The device recorded nothing on these days.");
    return;
  }
  html.element("p",
               "Exact figures. A gap is a day on which the device told nothing. Of a distribution "
               "the line is the mean, and the area reaches from the lowest to the highest value.");
  const std::size_t count = trends.all().size();
  std::size_t written = 0;
  html.begin("div", {{"class", "cards"}});
  for (; written < count && !kChartLimit.isReached(written, html); ++written)
    writeChart(scene, html, trends.all()[written]);
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
    writeRow(table, trends.all()[written]);
  table.end();
  writeLeftOut(html, count - written, "statistic", "tavrelctl stat list");
}

}  // namespace tavrel
