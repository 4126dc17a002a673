#include "fleet/pages/fleet_page.h"

#include <set>

#include "base/civil_time.h"
#include "fleet/pages/sections.h"
#include "page/document.h"

namespace tavrel::fleet {

namespace {

/// Nobody would read a longer page; `tavrel-fleet show` describes each statistic.
constexpr std::size_t kMostStatistics = 40;

/// Whether a scalar shows the wear of a drive: see docs/catalogue/channels.md and nand.md.
bool tellsOfWear(const Key& key) {
  if (key.kind != KeyKind::Scalar) return false;
  for (const std::string_view end :
       {".used_pct", ".life_a_pct", ".life_b_pct", ".erases_max", ".waf_milli", ".spare_pct",
        ".AverageCycle", ".HottestCycle"}) {
    if (key.name.ends_with(end)) return true;
  }
  return false;
}

ShowAnswer askAbout(Engine& engine, Ledger& ledger, const Key& key, const DayRange& days) {
  ShowRequest request;
  request.key = key.name;
  request.kind = key.kind;
  request.by = GroupBy::Os;
  request.days = days;
  request.leavesSmallOut = true;
  return show(engine, ledger, request);
}

}  // namespace

FleetPage askForPage(Engine& engine, Ledger& ledger, const DayRange& days) {
  FleetPage page;
  // The same logs as in the statistics: otherwise subtracting these would reveal small versions.
  page.summary = summarise(engine, ledger, days, SmallVersions::LeftOut);
  if (!page.summary.isShown) return page;
  if (const auto versions = newestVersions(ledger, days)) {
    page.comparison = compare(engine, ledger, {versions->first, versions->second, days});
  }

  // The largest changes come first, then distributions, then scalars.
  std::vector<Key> others;
  const auto add = [&](const Key& key) {
    if (tellsOfWear(key) && page.wear.size() < kMostStatistics) {
      page.wear.push_back(askAbout(engine, ledger, key, days));
    } else {
      others.push_back(key);
    }
  };
  std::set<std::pair<KeyKind, std::string>> known;
  if (page.comparison) {
    for (const Comparison& one : page.comparison->comparisons) {
      if (!one.isSignificant()) break;
      known.emplace(one.key.kind, one.key.name);
      add(one.key);
    }
  }
  for (const KeyKind kind : {KeyKind::Distribution, KeyKind::Scalar}) {
    for (const Key& key : page.summary.keys) {
      if (key.kind == kind && !known.contains({key.kind, key.name})) add(key);
    }
  }
  std::size_t shown = 0;
  for (const Key& key : others) {
    if (shown == kMostStatistics) {
      ++page.furtherStatistics;
      continue;
    }
    page.statistics.push_back(askAbout(engine, ledger, key, days));
    if (page.statistics.back().sides.front().isShown) ++shown;
  }
  return page;
}

std::string textOf(const FleetPage& page) {
  const SummaryAnswer& summary = page.summary;
  page::Document document("Fleet");
  if (!summary.isShown) {
    document.head().element("p", "No OS version has at least " + countText(summary.devicesAtLeast) +
                                     " devices on these days: nothing is shown.");
    return document.text();
  }
  document.head().element("p", dateText(civilFromDays(summary.whole.firstDay)) + " to " +
                                   dateText(civilFromDays(summary.whole.lastDay)) + ", at least " +
                                   countText(summary.whole.devices) + " devices, " +
                                   countText(summary.whole.logs) + " daily logs");
  writeInShort(document.section("In short"), page);
  if (page.comparison)
    writeChanges(document.section("What the newest version changed"), *page.comparison);
  if (!page.wear.empty()) writeStatistics(document.section("Wear of the flash"), page.wear, 0);
  writeFleet(document.section("The fleet"), summary);
  if (!page.statistics.empty()) {
    writeStatistics(document.section("Statistics by version"), page.statistics,
                    page.furtherStatistics);
  }
  page::HtmlWriter& html = document.section("How to read this page");
  html.element(
      "p",
      "A log is one day of one device and does not say which device it comes from. So devices "
      "cannot be counted; \"at least\" gives the number that reported on the busiest day.");
  html.element("p",
               "A percentage over a column of figures is the share of logs, or of values, that are "
               "not above the figure. Of series only the range in which it lies is known. Of other "
               "statistics, a percentile that is the lowest or the highest value is not shown.");
  html.element("p", "Groups of fewer than " + countText(summary.devicesAtLeast) +
                        " devices are not shown by themselves. The page leaves out all logs of "
                        "such versions; other groups are joined as \"" +
                        PartName{PartKind::Other}.text() +
                        "\", and where a subtraction could reveal them, so is the next larger "
                        "group. Buckets of histograms are joined in the same way.");
  html.element("p",
               "A difference is called a change only when chance would produce one of its size in "
               "fewer than one of twenty such comparisons of all statistics together. Versions ran "
               "on different days and on devices whose owners chose to update: the version need "
               "not be the cause of a difference.");
  return document.text();
}

}  // namespace tavrel::fleet
