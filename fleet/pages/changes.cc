// What changed between two versions, in words and as a chart.
#include <algorithm>
#include <cmath>

#include "catalogue/catalogue.h"
#include "fleet/pages/sections.h"
#include "page/charts.h"
#include "page/number_text.h"
#include "page/table.h"

namespace tavrel::fleet {

namespace {

constexpr std::size_t kMostSentences = 8;
constexpr std::size_t kMostChanges = 100;

/// In percent, with one decimal.
double percentOf(double share) {
  return std::round(std::abs(share) * 1000) / 10;
}

/// Uses the customary thresholds of effect sizes, in standard deviations.
std::string strengthText(const Comparison& one) {
  constexpr double kSmall = 0.2;
  constexpr double kMedium = 0.5;
  constexpr double kLarge = 0.8;
  if (!one.effect) return "a clear change: all daily logs of each version have the same value";
  const double effect = std::abs(*one.effect);
  const char* const size = effect < kSmall    ? "slight"
                           : effect < kMedium ? "small"
                           : effect < kLarge  ? "clear"
                                              : "large";
  return std::string("a ") + size +
         " change: " + page::shortNumber(std::round(effect * 100) / 100) +
         " standard deviations of the daily logs";
}

/// "fewer than 1 in 1,000".
std::string chanceText(double probability) {
  for (const auto& [limit, text] :
       {std::pair(1e-6, "fewer than 1 in a million"), std::pair(1e-3, "fewer than 1 in 1,000"),
        std::pair(1e-2, "fewer than 1 in 100")}) {
    if (probability < limit) return text;
  }
  return "fewer than 1 in 20";
}

const char* kindText(KeyKind kind) {
  return kind == KeyKind::Scalar ? "daily value" : "daily mean";
}

/// Adds the kind when both kinds of the key are compared.
std::string labelOf(const CompareAnswer& comparison, const Comparison& one) {
  const bool isAmbiguous =
      std::ranges::any_of(comparison.comparisons, [&](const Comparison& other) {
        return other.key.name == one.key.name && other.key.kind != one.key.kind;
      });
  const std::string name = nameOf(one.key.name);
  return isAmbiguous ? name + " (" + kindText(one.key.kind) + ")" : name;
}

std::size_t logsWithoutMean(const Comparison& one) {
  return one.before.logsWithoutMean + one.after.logsWithoutMean;
}

std::size_t changesOf(const CompareAnswer& comparison) {
  return static_cast<std::size_t>(
      std::count_if(comparison.comparisons.begin(), comparison.comparisons.end(),
                    [](const Comparison& one) { return one.isSignificant(); }));
}

/// Of the first of these statistics that enough devices have.
void writeWear(page::HtmlWriter& html, const std::vector<ShowAnswer>& answers) {
  const auto shown = std::ranges::find_if(
      answers, [](const ShowAnswer& answer) { return answer.sides.front().isShown; });
  if (shown == answers.end() || !shown->sides.front().whole.scalar) return;
  static_assert(kPercents[2] == 50 && kPercents[4] == 95);
  const ShownSet& whole = shown->sides.front().whole;
  const auto& percentiles = whole.scalar->percentiles;
  const std::string_view unit = catalogue::unitOf(shown->request.key);
  html.begin("p");
  html.text("Flash: ");
  html.name(nameOf(shown->request.key));
  html.text(" is at most " + page::figureText(static_cast<double>(percentiles[2]), unit) +
            " in half of the daily logs");
  if (!isOfOneDevice(whole, 4)) {
    html.text(", and above " + page::figureText(static_cast<double>(percentiles[4]), unit) +
              " in no more than one of twenty");
  }
  html.text(".");
  html.end();
}

void writeChart(page::HtmlWriter& html, const CompareAnswer& comparison) {
  page::IntervalChart chart;
  chart.name = "Changes in percent";
  chart.text = [](double value) { return page::shortNumber(std::round(value * 10) / 10) + " %"; };
  std::size_t unchanged = 0;
  for (const Comparison& one : comparison.comparisons) {
    if (!one.isSignificant() && chart.rows.size() >= kMostSentences) {
      ++unchanged;
      continue;
    }
    if (!one.relative || !std::isfinite(one.margin)) {
      if (!one.isSignificant()) ++unchanged;
      continue;
    }
    const double scale = 100 / std::abs(one.before.mean);
    chart.rows.push_back({labelOf(comparison, one), (one.difference - one.margin) * scale,
                          one.difference * scale, (one.difference + one.margin) * scale,
                          one.isSignificant() ? changeText(one) : "no change beyond chance",
                          one.isSignificant()});
  }
  if (!chart.rows.empty()) writeIntervals(html, chart);
  if (unchanged != 0) {
    html.element("p", counted(unchanged, "more statistic") + " without a change beyond chance.",
                 {{"class", "note"}});
  }
}

void writeTable(page::HtmlWriter& html, const CompareAnswer& comparison) {
  using Align = page::Table::Align;
  page::Table table(html, "Changes",
                    {{"Statistic", Align::Name},
                     {"Compared", Align::Text},
                     {"Before", Align::Number},
                     {"After", Align::Number},
                     {"Standard deviations", Align::Number},
                     {"Devices", Align::Number}});
  for (const Comparison& one : comparison.comparisons) {
    if (!one.isSignificant()) break;
    const std::string_view unit = catalogue::unitOf(one.key.name);
    table.row();
    table.cell([&](page::HtmlWriter& cell) { cell.name(one.key.name); });
    table.cell(kindText(one.key.kind));
    table.cell(page::figureText(one.before.mean, unit));
    table.cell(page::figureText(one.after.mean, unit));
    table.cell(one.effect ? page::shortNumber(std::round(*one.effect * 100) / 100 + 0.0)
                          : "constant");
    table.cell(countText(one.before.devices) + " and " + countText(one.after.devices));
  }
  table.end();
}

void writeLeftOut(page::HtmlWriter& html, const CompareAnswer& comparison) {
  for (const Comparison& one : comparison.comparisons) {
    if (!one.isSignificant() || logsWithoutMean(one) == 0) continue;
    html.begin("p", {{"class", "note"}});
    html.name(one.key.name);
    html.text(" is compared without " +
              withoutMeanText(logsWithoutMean(one), comparison.devicesAtLeast) + ".");
    html.end();
  }
  const std::size_t leftOut = comparison.leftOut + comparison.unfit;
  if (leftOut != 0) {
    html.element("p",
                 "Left out: " + counted(leftOut, "statistic") +
                     " not in both versions, of too few devices, or without a mean.",
                 {{"class", "note"}});
  }
}

}  // namespace

std::string nameOf(std::string_view key) {
  const catalogue::Entry* entry = catalogue::findStatistic(key);
  if (entry == nullptr || entry->meaning.empty()) return std::string(key);
  // The rest of the meaning explains the figure further.
  return std::string(entry->meaning.substr(0, entry->meaning.find_first_of(";:")));
}

std::string withoutMeanText(std::size_t logs, std::size_t devicesAtLeast) {
  return (logs < devicesAtLeast ? "a few" : countText(logs)) +
         " logs that have no mean, because some of the values are not finite or lie too far apart";
}

std::string changeText(const Comparison& one) {
  const std::string_view unit = catalogue::unitOf(one.key.name);
  const double percent = percentOf(one.relative.value_or(0));
  return (percent != 0 ? page::shortNumber(percent) + " % " : "") +
         (one.difference > 0 ? "higher" : "lower") + " (" +
         page::figureText(one.before.mean, unit) + " → " + page::figureText(one.after.mean, unit) +
         ")";
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
  const std::string compared = counted(comparison.comparisons.size(), "statistic");
  html.text(comparison.comparisons.empty() ? ", no statistic could be compared."
            : changes == 0 ? ", none of " + compared + " changed beyond what chance explains."
                           : ", " + countText(changes) + " of " + compared + " changed:");
  html.end();
  if (changes != 0) html.begin("ul");
  for (std::size_t i = 0; i < std::min(changes, kMostSentences); ++i) {
    const Comparison& one = comparison.comparisons[i];
    html.begin("li");
    html.begin("strong");
    html.name(labelOf(comparison, one));
    html.text(": " + changeText(one));
    html.end();
    html.text(". This is " + strengthText(one) + ". Chance alone would show such a difference in " +
              chanceText(one.adjustedPValue) + " comparisons.");
    html.end();
  }
  if (changes > kMostSentences) {
    html.element("li", "and " + countText(changes - kMostSentences) + " more: see below.");
  }
  if (changes != 0) html.end();
  writeWear(html, page.wear);
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
      ". The dots are the changes of the means in percent, the lines their 95 % confidence "
      "intervals.");
  html.end();
  // Changes come first, the largest before the others.
  const std::size_t changes = changesOf(comparison);
  const std::size_t further = changes - std::min(changes, kMostChanges);
  CompareAnswer shown = comparison;
  const auto end = shown.comparisons.begin() + static_cast<std::ptrdiff_t>(changes);
  shown.comparisons.erase(end - static_cast<std::ptrdiff_t>(further), end);
  writeChart(html, shown);
  writeTable(html, shown);
  if (further != 0) {
    html.element("p", "tavrel-fleet compare lists " + counted(further, "more change") + ".",
                 {{"class", "note"}});
  }
  writeLeftOut(html, shown);
}

}  // namespace tavrel::fleet
