// The statistics of the day, both exact and as they leave the device.
#include <algorithm>
#include <functional>
#include <numeric>
#include <span>

#include "base/format.h"
#include "base/text.h"
#include "catalogue/catalogue.h"
#include "page/charts.h"
#include "page/number_text.h"
#include "page/table.h"
#include "tools/console/day_argument.h"
#include "tools/console/table.h"
#include "tools/page/sections.h"

namespace tavrel {
namespace {

using page::figureText;
using page::shortNumber;

constexpr SectionLimit kScalarLimit{1000, 350'000};
constexpr SectionLimit kDistributionLimit{100, 350'000};
// Intervals of the log shown per distribution, the fullest ones.
constexpr std::size_t kIntervals = 64;

// The text for the log's column, whatever the type of the value.
std::string coarseText(const plist::Value& value) {
  const auto number = value.number();
  if (!number) return textOf(value);
  if (!number->isFloating()) return shortNumber(number->int64());
  return shortNumber(number->real());
}

// A scalar on that day and in its log; either may be missing.
struct ScalarRow {
  std::string_view key;
  std::optional<std::int64_t> exact;
  plist::Value coarse;
};

std::vector<ScalarRow> scalarRows(const PageScene& scene) {
  std::map<std::string_view, ScalarRow> rows;
  for (const auto& [key, scalar] : scene.recorded.scalars) {
    if (const auto* const value = scene.recorded.ofDay(scalar.days)) rows[key] = {key, *value, {}};
  }
  for (const plist::Entry& entry : scene.log.scalars) {
    ScalarRow& row = rows[entry.key.view()];
    row.key = entry.key.view();
    row.coarse = entry.value;
  }
  std::vector<ScalarRow> list;
  for (const bool isInLog : {true, false}) {
    for (const auto& [key, row] : rows)
      if (row.coarse.isNull() != isInLog) list.push_back(row);
  }
  return list;
}

void writeScalarRow(page::Table& table, const ScalarRow& row) {
  const std::string_view unit = catalogue::unitOf(row.key);
  table.row();
  table.cell([&](page::HtmlWriter& cell) { writeKey(cell, row.key); });
  table.cell(row.exact ? shortNumber(*row.exact) : "not kept");
  table.cell([&](page::HtmlWriter& cell) {
    if (row.coarse.isNull()) {
      cell.element("small", "not in it");
    } else {
      cell.text(coarseText(row.coarse));
    }
  });
  table.cell(unit == "count" || unit == "number" ? "" : unit);
}

void writeNoDay(const PageScene& scene, page::HtmlWriter& html, std::string_view what) {
  if (!scene.recorded.fault.empty()) {
    html.element("p", format("Not known: %s", scene.recorded.fault));
    return;
  }
  html.element("p",
               format("The device recorded no %s on %s.", what, dayDateText(scene.recorded.day)));
}

// Says what the log of the day means for the figures of a section.
void writeLogState(const PageScene& scene, page::HtmlWriter& html, std::uint64_t leaving,
                   std::uint64_t all, std::string_view what) {
  std::string text;
  if (!scene.log.reason.empty()) {
    text = format("%s. None leaves the device, because there is no log of this day: %s.",
                  counted(all, what), scene.log.reason);
  } else {
    text = format("%s, of which the log of this day has %llu. ", counted(all, what), leaving);
    text += scene.log.isCovered
                ? "The owner lets that log leave the device."
                : "That log stays here: the owner has not allowed it to leave the device.";
  }
  html.begin("p");
  html.name(text);
  html.end();
}

std::string rangeText(const Summary& summary, std::string_view unit) {
  const std::string low = figureText(summary.minimum(), unit);
  const std::string high = figureText(summary.maximum(), unit);
  if (low != high || summary.minimum() == summary.maximum()) return format("%s to %s", low, high);
  // Ends that rounding makes alike are written in full.
  return format("%s to %s", page::exactFigure(summary.minimum(), unit),
                page::exactFigure(summary.maximum(), unit));
}

// The two ends of a label such as "(10, 20]".
std::pair<std::string, std::string> endsOf(const std::string& label) {
  const std::size_t comma = label.find(", ");
  if (comma == std::string::npos || label.size() < 2) return {label, label};
  return {label.substr(1, comma - 1), label.substr(comma + 2, label.size() - comma - 3)};
}

void writeDayHistogram(page::HtmlWriter& html, std::string_view key, const DayValues& values) {
  if (values.buckets.empty()) return;
  page::Histogram histogram{std::string(key), {}, {}, {}};
  for (const auto& bucket : values.buckets)
    histogram.cells.push_back({bucket.label, static_cast<double>(bucket.count)});
  histogram.lowest = endsOf(values.buckets.front().label).first;
  histogram.highest = endsOf(values.buckets.back().label).second;
  writeHistogram(html, histogram);
}

// The fullest intervals, in their order.
std::vector<page::Bar> barsOf(std::span<const DistributionView::Bucket> buckets) {
  std::vector<std::size_t> order(buckets.size());
  std::iota(order.begin(), order.end(), std::size_t{0});
  std::ranges::stable_sort(order, std::greater(), [&](std::size_t i) { return buckets[i].count; });
  order.resize(std::min(order.size(), kIntervals));
  std::ranges::sort(order);
  std::vector<page::Bar> bars;
  for (const std::size_t i : order) {
    const auto count = static_cast<double>(buckets[i].count);
    bars.push_back({buckets[i].label, count, shortNumber(count)});
  }
  return bars;
}

void writeLogHistogram(page::HtmlWriter& html, const DistributionView* leaving) {
  html.begin("p", {{"class", "note leaves"}});
  if (leaving == nullptr) {
    html.text("Not in the log");
    html.end();
    return;
  }
  html.text(leaving->buckets.empty()
                ? "In the log: count, range, mean and deviation"
                : "In the log: count, range, mean and deviation, and how many values are in");
  html.end();
  const std::vector<page::Bar> bars = barsOf(leaving->buckets);
  if (bars.empty()) return;
  writeBars(html, format("Intervals of %s", leaving->key), bars);
  const std::size_t more = leaving->buckets.size() - bars.size();
  if (more == 0) return;
  double rest = 0;
  for (const auto& bucket : leaving->buckets)
    rest += static_cast<double>(bucket.count);
  for (const page::Bar& bar : bars)
    rest -= bar.value;
  html.begin("p", {{"class", "note leaves"}});
  html.text(
      format("%s with %s values together", counted(more, "more interval"), shortNumber(rest)));
  html.end();
}

void writeDistribution(page::HtmlWriter& html, std::string_view key, const Summary& summary,
                       const DayValues& values, const DistributionView* leaving) {
  const std::string_view unit = catalogue::unitOf(key);
  beginCard(html, key);
  writeKey(html, key);
  html.end();
  html.begin("dl", {{"class", "figures"}});
  const auto figure = [&html](std::string_view term, std::string_view text) {
    html.begin("div");
    html.element("dt", term);
    html.element("dd", text);
    html.end();
  };
  figure("Values", shortNumber(summary.count()));
  if (summary.numbers() > 0) {
    figure("Range", rangeText(summary, unit));
    if (values.median) figure("Median", figureText(*values.median, unit));
    figure("Mean", figureText(summary.mean(), unit));
  }
  if (summary.notNumbers() > 0) figure("Not a number", shortNumber(summary.notNumbers()));
  html.end();
  writeDayHistogram(html, key, values);
  writeLogHistogram(html, leaving);
  html.end();
}

}  // namespace

void writeKey(page::HtmlWriter& html, std::string_view key) {
  html.name(key);
  if (const auto* entry = catalogue::findStatistic(key); entry && !entry->meaning.empty())
    html.element("small", entry->meaning);
}

void beginCard(page::HtmlWriter& html, std::string_view key) {
  constexpr std::size_t kWide = 120;
  html.begin("article", {{"class", key.size() > kWide ? "card wide" : "card"}});
  html.begin("h3");
}

void writeScalars(PageScene& scene) {
  page::HtmlWriter& html = scene.document.section("Scalars of the day");
  const std::vector<ScalarRow> rows = scalarRows(scene);
  if (rows.empty()) return writeNoDay(scene, html, "scalar");
  const auto stays = [](const ScalarRow& row) { return row.coarse.isNull(); };
  const auto leaving = rows.size() - static_cast<std::size_t>(std::ranges::count_if(rows, stays));
  writeLogState(scene, html, leaving, rows.size(), "scalar");
  constexpr auto kNumber = page::Table::Align::Number;
  page::Table table(html, "Scalars",
                    {{"Statistic", page::Table::Align::Name},
                     {"Exact", kNumber},
                     {"In the log", kNumber},
                     {"Unit"}});
  std::size_t written = 0;
  for (; written < rows.size() && !kScalarLimit.isReached(written, html); ++written)
    writeScalarRow(table, rows[written]);
  table.end();
  writeLeftOut(html, rows.size() - written, "scalar",
               format("tavrelctl stat list --day %s", dayDateText(scene.recorded.day)));
}

void writeDistributions(PageScene& scene) {
  page::HtmlWriter& html = scene.document.section("Distributions of the day");
  std::map<std::string_view, const DistributionView*> leaving;
  for (const DistributionView& view : scene.log.distributions)
    leaving[view.key] = &view;
  struct Row {
    std::string_view key;
    const Summary* summary;
    const DayValues* values;
  };
  std::vector<Row> rows;
  for (const auto& [key, recorded] : scene.recorded.distributions) {
    if (const Summary* const summary = scene.recorded.ofDay(recorded.days))
      rows.push_back({key, summary, &recorded.values});
  }
  if (rows.empty()) return writeNoDay(scene, html, "distribution");
  // Statistics that are in the log come first.
  const auto others = std::stable_partition(
      rows.begin(), rows.end(), [&](const Row& row) { return leaving.contains(row.key); });
  writeLogState(scene, html, static_cast<std::uint64_t>(others - rows.begin()), rows.size(),
                "distribution");
  html.begin("div", {{"class", "cards"}});
  std::size_t written = 0;
  for (; written < rows.size() && !kDistributionLimit.isReached(written, html); ++written) {
    const Row& row = rows[written];
    const auto view = leaving.find(row.key);
    writeDistribution(html, row.key, *row.summary, *row.values,
                      view == leaving.end() ? nullptr : view->second);
  }
  html.end();
  writeLeftOut(html, rows.size() - written, "distribution",
               format("tavrelctl stat list --day %s", dayDateText(scene.recorded.day)));
}

}  // namespace tavrel
