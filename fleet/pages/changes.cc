// What changed between two versions, in words and as a chart.
#include <algorithm>
#include <cmath>
#include <limits>

#include "catalogue/catalogue.h"
#include "fleet/pages/sections.h"
#include "page/charts.h"
#include "page/number_text.h"
#include "page/table.h"

namespace tavrel::fleet {

namespace {

constexpr std::size_t kMostSentences = 8;

std::string percentText(double share) {
  return page::shortNumber(std::round(std::abs(share) * 1000) / 10) + " %";
}

/// By the customary steps of effects in standard deviations.
std::string_view strengthText(const Comparison& one) {
  constexpr double kSmall = 0.2;
  constexpr double kMedium = 0.5;
  constexpr double kLarge = 0.8;
  const double effect =
      one.effect ? std::abs(*one.effect) : std::numeric_limits<double>::infinity();
  if (effect < kSmall) return "a slight change: single devices differ far more from each other";
  if (effect < kMedium) return "a small change beside how devices differ from each other";
  if (effect < kLarge) return "a clear change beside how devices differ from each other";
  return "a large change: most devices are affected";
}

/// "fewer than 1 of 1,000".
std::string chanceText(double probability) {
  for (const auto& [limit, text] :
       {std::pair(1e-6, "fewer than 1 of a million"), std::pair(1e-3, "fewer than 1 of 1,000"),
        std::pair(1e-2, "fewer than 1 of 100")}) {
    if (probability < limit) return text;
  }
  return "fewer than 1 of 20";
}

std::size_t changesOf(const CompareAnswer& comparison) {
  return static_cast<std::size_t>(
      std::count_if(comparison.comparisons.begin(), comparison.comparisons.end(),
                    [](const Comparison& one) { return one.isReal(); }));
}

}  // namespace

std::string nameOf(std::string_view key) {
  const catalogue::Entry* entry = catalogue::findStatistic(key);
  if (entry == nullptr || entry->meaning.empty()) return std::string(key);
  // What follows explains the figure further.
  return std::string(entry->meaning.substr(0, entry->meaning.find_first_of(";:")));
}

std::string_view unitOf(std::string_view key) {
  const catalogue::Entry* entry = catalogue::findStatistic(key);
  return entry == nullptr ? "" : entry->unit;
}

std::string changeText(const Comparison& one) {
  const std::string_view unit = unitOf(one.key.name);
  std::string text = one.relative && *one.relative != 0
                         ? percentText(*one.relative) + (one.difference > 0 ? " higher" : " lower")
                     : one.difference > 0 ? "higher"
                                          : "lower";
  return text + " (" + page::figureText(one.before.mean, unit) + " → " +
         page::figureText(one.after.mean, unit) + ")";
}

void writeInShort(page::HtmlWriter& html, const FleetPage& page) {
  const SummaryAnswer& summary = page.summary;
  if (!page.comparison) {
    html.element("p", "No two OS versions have enough devices to be compared.");
    return;
  }
  const CompareAnswer& comparison = *page.comparison;
  const std::size_t changes = changesOf(comparison);
  html.begin("p");
  html.text("From ");
  html.name(comparison.request.oldVersion);
  html.text(" to ");
  html.name(comparison.request.newVersion);
  html.text(changes == 0 ? ", none of " + countText(comparison.comparisons.size()) +
                               " statistics changed beyond what chance explains."
                         : ", " + countText(changes) + " of " +
                               countText(comparison.comparisons.size()) + " statistics changed:");
  html.end();
  if (changes != 0) html.begin("ul");
  for (std::size_t i = 0; i < std::min(changes, kMostSentences); ++i) {
    const Comparison& one = comparison.comparisons[i];
    html.begin("li");
    html.begin("strong");
    html.name(nameOf(one.key.name));
    html.text(": " + changeText(one));
    html.end();
    html.text(". This is " + std::string(strengthText(one)) +
              ". Chance alone would show such a difference in " + chanceText(one.corrected) +
              " comparisons.");
    html.end();
  }
  if (changes > kMostSentences) {
    html.element("li", "and " + countText(changes - kMostSentences) + " more, listed below.");
  }
  if (changes != 0) html.end();
  if (!page.wear.empty() && page.wear.front().sides.front().isShown) {
    const ShowAnswer& wear = page.wear.front();
    const ShownSet& all = wear.sides.front().whole;
    const std::string_view unit = unitOf(wear.request.key);
    if (all.scalar) {
      html.begin("p");
      html.text("Flash: ");
      html.name(nameOf(wear.request.key));
      html.text(", half of the devices up to " +
                page::figureText(static_cast<double>(all.scalar->percentiles[2]), unit) +
                ", one of twenty above " +
                page::figureText(static_cast<double>(all.scalar->percentiles[4]), unit) + ".");
      html.end();
    }
  }
  html.element("p",
               "These figures are of at least " + countText(summary.whole.devices) + " devices.",
               {{"class", "note"}});
}

void writeChanges(page::HtmlWriter& html, const CompareAnswer& comparison) {
  html.begin("p");
  html.name(comparison.request.oldVersion);
  html.text(" beside ");
  html.name(comparison.request.newVersion);
  html.text(
      ". The dots are the changes of the means in percent, the lines what they may be with a "
      "certainty of 95 %.");
  html.end();

  page::IntervalChart chart;
  chart.name = "Changes in percent";
  chart.text = [](double value) { return page::shortNumber(std::round(value * 10) / 10) + " %"; };
  std::size_t unchanged = 0;
  for (const Comparison& one : comparison.comparisons) {
    if (!one.isReal() && chart.rows.size() >= kMostSentences) {
      ++unchanged;
      continue;
    }
    if (!one.relative || !std::isfinite(one.margin)) continue;
    const double scale = 100 / std::abs(one.before.mean);
    chart.rows.push_back({nameOf(one.key.name), (one.difference - one.margin) * scale,
                          one.difference * scale, (one.difference + one.margin) * scale,
                          one.isReal() ? changeText(one) : "no change beyond chance",
                          one.isReal()});
  }
  if (!chart.rows.empty()) writeIntervals(html, chart);
  if (unchanged != 0) {
    html.element("p", countText(unchanged) + " more statistics did not change.",
                 {{"class", "note"}});
  }

  using Align = page::Table::Align;
  page::Table table(html, "Changes",
                    {{"Statistic", Align::Name},
                     {"Before", Align::Number},
                     {"After", Align::Number},
                     {"Standard deviations", Align::Number},
                     {"Devices", Align::Number}});
  for (const Comparison& one : comparison.comparisons) {
    if (!one.isReal()) break;
    const std::string_view unit = unitOf(one.key.name);
    table.row();
    table.cell([&](page::HtmlWriter& cell) { cell.name(one.key.name); });
    table.cell(page::figureText(one.before.mean, unit));
    table.cell(page::figureText(one.after.mean, unit));
    table.cell(one.effect ? page::shortNumber(std::round(*one.effect * 100) / 100) : "constant");
    table.cell(countText(one.before.devices) + " and " + countText(one.after.devices));
  }
  table.end();
  const std::size_t leftOut = comparison.missing + comparison.tooFew + comparison.unfit;
  if (leftOut != 0) {
    html.element("p",
                 "Left out: " + countText(leftOut) + (leftOut == 1 ? " statistic" : " statistics") +
                     " not in both versions, of too few devices, or with values that are no finite "
                     "numbers.",
                 {{"class", "note"}});
  }
}

}  // namespace tavrel::fleet
