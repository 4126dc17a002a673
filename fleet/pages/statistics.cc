// The parts of the fleet, and its statistics by version.
#include <algorithm>
#include <cmath>
#include <span>

#include "base/civil_time.h"
#include "catalogue/catalogue.h"
#include "fleet/pages/sections.h"
#include "fleet/questions/merged_numbers.h"
#include "page/charts.h"
#include "page/number_text.h"
#include "page/table.h"

namespace tavrel::fleet {

namespace {

/// Nobody would read more.
constexpr std::size_t kMostBars = 1'000;              // of one statistic
constexpr std::size_t kMostSectionBytes = 1'000'000;  // when a statistic begins

void writeGroups(page::HtmlWriter& html, const char* title, const SummaryPart& part,
                 std::size_t devicesAtLeast) {
  html.element("h3", title);
  std::vector<page::Bar> bars;
  for (const CountedGroup& group : part.groups) {
    bars.push_back({group.name.text(), static_cast<double>(group.devices),
                    countText(group.devices) + " devices"});
  }
  if (!bars.empty()) {
    writeBars(html, title, bars);
  } else {
    html.element("p",
                 "Not divided: there would be groups of fewer than " + countText(devicesAtLeast) +
                     " devices.",
                 {{"class", "note"}});
  }
}

/// Leaves out units that are words: they stand above the table.
std::string cellText(double value, std::string_view unit) {
  std::string text = page::figureText(value, unit);
  if (!unit.empty() && text.ends_with(" " + std::string(unit))) {
    text.resize(text.size() - unit.size() - 1);
  }
  return text;
}

/// `text` writes one end.
template <class Text>
std::string intervalText(const Interval& interval, const Text& text) {
  if (std::isinf(interval.lower) && std::isinf(interval.upper)) return "not known";
  if (std::isinf(interval.lower)) return "up to " + text(interval.upper);
  if (std::isinf(interval.upper)) return "above " + text(interval.lower);
  return text(interval.lower) + " to " + text(interval.upper);
}

std::string percentileText(const ShownSet& set, std::size_t index, std::string_view unit) {
  if (set.scalar) {
    return isOfOneDevice(set, index)
               ? "not shown"
               : cellText(static_cast<double>(set.scalar->percentiles[index]), unit);
  }
  if (index >= set.histogram.percentiles.size()) return "";
  const Interval& interval = set.histogram.percentiles[index];
  const auto shortText = [unit](double end) { return cellText(end, unit); };
  const std::string lower = shortText(interval.lower);
  if (lower != shortText(interval.upper)) return intervalText(interval, shortText);
  // Ends that shortening makes alike are written in full.
  std::string text = intervalText(interval, page::exactNumber);
  const bool isInUnitAbove = lower == page::shortNumber(interval.lower);
  return isInUnitAbove ? text : text.append(" ").append(unit);
}

std::string meanText(const ShownSet& set, std::string_view unit) {
  const double mean =
      set.scalar ? set.scalar->mean : set.merged.value_or(MergedAnswer{}).numbers.mean;
  return std::isfinite(mean) ? cellText(mean, unit) : "not available";
}

void writeSets(page::HtmlWriter& html, const ShowSide& side, const std::string& name,
               std::string_view unit) {
  const bool hasPercentiles = side.whole.scalar || !side.whole.histogram.percentiles.empty();
  using Align = page::Table::Align;
  std::vector<page::Table::Column> columns = {
      {"Version", Align::Name}, {"Devices", Align::Number}, {"Mean", Align::Number}};
  if (hasPercentiles) {
    for (const unsigned percent : kPercents) {
      columns.push_back({percent == 50 ? "Median" : std::to_string(percent) + " %", Align::Number});
    }
  }
  page::Table table(html, name, std::move(columns));
  const auto row = [&](const ShownSet& set) {
    table.row();
    table.cell([&](page::HtmlWriter& cell) { cell.name(set.name.text()); });
    table.cell(countText(set.devices));
    table.cell(meanText(set, unit));
    for (std::size_t i = 0; i < kPercents.size() && hasPercentiles; ++i) {
      table.cell(percentileText(set, i, unit));
    }
  };
  for (const ShownSet& group : side.groups)
    row(group);
  if (side.groups.size() != 1) row(side.whole);
  table.end();
}

/// Joined buckets may differ in width, so each has a row with its own label.
void writeHistogramOf(page::HtmlWriter& html, const ShownSet& set, const std::string& name) {
  std::vector<page::Bar> bars;
  for (const Piece& piece : set.histogram.pieces) {
    std::string count = countText(piece.least);
    if (piece.least != piece.most) count += " to " + countText(piece.most);
    bars.push_back({intervalText({piece.lower, piece.upper}, page::exactNumber),
                    static_cast<double>(piece.least), count});
  }
  if (bars.size() < 2) return;
  html.begin("div", {{"class", "card"}});
  html.begin("h3");
  html.name(set.name.text());
  html.end();
  writeBars(html, name + ", " + set.name.text(), bars);
  html.end();
}

void writeHistograms(page::HtmlWriter& html, const ShowSide& side, const std::string& name) {
  const std::span sets = side.groups.empty() ? std::span(&side.whole, 1) : std::span(side.groups);
  std::size_t buckets = 0;
  for (const ShownSet& set : sets)
    buckets += set.histogram.pieces.size();
  if (buckets > kMostBars) {
    html.element("p",
                 "tavrel-fleet show --buckets prints the histograms, which have " +
                     countText(buckets) + " buckets.",
                 {{"class", "note"}});
    return;
  }
  html.begin("div", {{"class", "cards"}});
  for (const ShownSet& set : sets)
    writeHistogramOf(html, set, name);
  html.end();
}

void writeStatistic(page::HtmlWriter& html, const ShowAnswer& answer) {
  const ShowSide& side = answer.sides.front();
  const std::string name = nameOf(answer.request.key);
  const std::string_view unit = catalogue::unitOf(answer.request.key);
  html.begin("h3");
  html.name(name);
  html.end();
  html.begin("p", {{"class", "note"}});
  if (name != answer.request.key) {
    html.name(answer.request.key);
    html.text(", ");
  }
  const bool isScalar = answer.request.kind == KeyKind::Scalar;
  html.text(isScalar ? "one value per log" : "many values per log");
  if (!unit.empty()) html.text(" (" + std::string(unit) + ")");
  html.end();
  writeSets(html, side, name, unit);
  const std::size_t withoutMean = side.whole.merged ? side.whole.merged->logsWithoutMean : 0;
  if (withoutMean != 0) {
    html.element("p",
                 "The mean is without " + withoutMeanText(withoutMean, answer.devicesAtLeast) + ".",
                 {{"class", "note"}});
  }
  writeHistograms(html, side, name);
}

}  // namespace

std::string countText(std::size_t count) {
  std::string text = std::to_string(count);
  for (std::size_t place = text.size(); place > 3; place -= 3)
    text.insert(place - 3, ",");
  return text;
}

std::string counted(std::size_t count, const std::string& what) {
  return countText(count) + " " + what + (count == 1 ? "" : "s");
}

bool isOfOneDevice(const ShownSet& set, std::size_t index) {
  const std::size_t rank = (kPercents[index] * set.logs + 99) / 100;
  return rank <= 1 || rank >= set.logs;
}

void writeFleet(page::HtmlWriter& html, const SummaryAnswer& summary) {
  for (const SummaryPart& part : summary.parts) {
    if (part.by == GroupBy::Os) writeGroups(html, "OS versions", part, summary.devicesAtLeast);
    if (part.by == GroupBy::Region) writeGroups(html, "Regions", part, summary.devicesAtLeast);
    // A century. Other programs may have filed any day.
    constexpr std::int64_t kMostDays = 36'525;
    const auto [firstDay, lastDay] =
        std::pair<std::int64_t, std::int64_t>(summary.whole.firstDay, summary.whole.lastDay);
    if (part.by != GroupBy::Day || lastDay - firstDay > kMostDays) continue;
    page::LineChart chart;
    chart.name = "Devices by day";
    std::vector<std::size_t> counts;
    std::int64_t next = firstDay;
    for (const CountedGroup& group : part.groups) {
      if (!group.name.isValue()) continue;
      for (; next < group.firstDay; ++next)
        chart.values.push_back(std::nullopt);
      counts.push_back(group.devices);
      chart.values.push_back(static_cast<double>(group.devices));
      next = std::int64_t{group.firstDay} + 1;
    }
    if (chart.values.size() < 2) continue;
    for (; next <= lastDay; ++next)
      chart.values.push_back(std::nullopt);
    chart.first = dateText(civilFromDays(summary.whole.firstDay));
    chart.last = dateText(civilFromDays(summary.whole.lastDay));
    const auto [lowest, highest] = std::ranges::minmax(counts);
    chart.lowest = countText(lowest);
    chart.highest = countText(highest);
    chart.latest = countText(counts.back());
    html.element("h3", "Devices that reported, by day");
    writeLineChart(html, chart);
    if (part.joined == 0) continue;
    html.element("p",
                 "Without " + counted(part.joined, "day") +
                     ", so that nothing reveals groups of fewer than " +
                     countText(summary.devicesAtLeast) + " devices.",
                 {{"class", "note"}});
  }
}

void writeStatistics(page::HtmlWriter& html, const std::vector<ShowAnswer>& answers,
                     std::size_t further) {
  std::size_t hidden = 0;
  for (const ShowAnswer& answer : answers) {
    if (!answer.sides.front().isShown) {
      ++hidden;
    } else if (html.written().size() >= kMostSectionBytes) {
      ++further;
    } else {
      writeStatistic(html, answer);
    }
  }
  if (hidden != 0) {
    html.element("p", "Not shown: " + counted(hidden, "statistic") + " of too few devices.",
                 {{"class", "note"}});
  }
  if (further != 0) {
    html.element("p", "tavrel-fleet show prints " + counted(further, "more statistic") + ".",
                 {{"class", "note"}});
  }
}

}  // namespace tavrel::fleet
