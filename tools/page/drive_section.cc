// Drives: their wear, their expected lifetime, and everything else that they report.
#include <algorithm>
#include <cmath>
#include <optional>
#include <utility>

#include "base/civil_time.h"
#include "base/format.h"
#include "base/quantity_text.h"
#include "page/charts.h"
#include "page/number_text.h"
#include "page/table.h"
#include "tools/console/table.h"
#include "tools/disks/disk_list.h"
#include "tools/page/sections.h"

namespace tavrel {
namespace {

using namespace health;

constexpr SectionLimit kDriveLimit{32, 150'000};

std::optional<std::int64_t> figureOf(const Disk& disk, std::string_view name) {
  const std::int64_t* const value = valueOf(disk.reading.figures, name);
  return value ? std::optional(*value) : std::nullopt;
}

// In percentage points. Figures of eMMC and UFS are the upper ends of steps.
double stepOf(const Wear& wear) {
  return wear.figure == "used_pct" ? 1 : 10;
}

/// Days until the drive is worn out if wear continues at the same pace.
std::optional<double> daysLeft(double percentUsed, double inDays, double percentNow) {
  if (percentUsed <= 0 || inDays <= 0) return std::nullopt;
  return std::max(100 - percentNow, 0.0) * inDays / percentUsed;
}

// The wear that the daily run stored over the days of the page.
struct Trend {
  double growth = 0;  // in percent
  double inDays = 0;
  bool isReplacement = false;  // earlier days were those of another drive
};

// The kernel gives the name of a drive to its replacement. Between two values of one drive, wear
// does not shrink, and does not grow by more than a step of the figure or a pace that would wear
// out the drive in weeks.
Trend trendOf(const PageScene& scene, const Disk& disk, const Wear& wear) {
  Trend trend;
  const auto known = scene.recorded.scalars.find(
      format("com.norvane.ioreport.%s.%s", disk.reading.name, wear.figure));
  if (known == scene.recorded.scalars.end() || known->second.days.empty()) return trend;
  constexpr double kMostPerDay = 5;
  double lastDay = known->second.days.front().first;
  auto lastPercent = static_cast<double>(known->second.days.front().second);
  const auto follow = [&](double day, std::int64_t value, bool isRecorded) {
    const auto percent = static_cast<double>(value);
    const double grown = percent - std::exchange(lastPercent, percent);
    const double inDays = day - std::exchange(lastDay, day);
    if (grown < 0 || grown > std::max(stepOf(wear), kMostPerDay * inDays)) {
      trend = {0, 0, true};
    } else if (isRecorded) {
      trend.growth += grown;
      trend.inDays += inDays;
    }
  };
  for (const auto& [day, percent] : known->second.days)
    follow(day, percent, true);
  follow(static_cast<double>(disk.reading.time) / kSecondsPerDay, wear.percent, false);
  return trend;
}

std::string yearsText(double days) {
  constexpr double kYear = 365.25;
  if (days < 2 * kYear) return counted(static_cast<std::uint64_t>(std::llround(days)), "day");
  if (days >= 100 * kYear) return "more than 100 years";
  const double years = days / kYear;
  return format("%.*f years", years < 10 ? 1 : 0, years);
}

std::string lifetimeText(const PageScene& scene, const Disk& disk) {
  const auto wear = wearOf(disk);
  if (!wear) return "Not known: the drive reports no wear";
  const double step = stepOf(*wear);
  const bool isStep = step > 1;
  if (wear->percent == 100 && isStep) return "At most a tenth of its rated life";
  if (wear->percent >= 100) return "Its rated life is used up";
  const Trend trend = trendOf(scene, disk, *wear);
  const auto byTrend = [&](double leastGrowth) -> std::optional<std::string> {
    if (trend.growth < leastGrowth) return std::nullopt;
    const auto days = daysLeft(trend.growth, trend.inDays, static_cast<double>(wear->percent));
    if (!days) return std::nullopt;
    return format("About %s at the pace of the days on this page", yearsText(*days));
  };
  // The recent pace is a better guide than that of the whole life, unless it is only a step or two.
  constexpr double kClearSteps = 3;
  if (const auto text = byTrend(kClearSteps * step)) return *text;
  constexpr double kHoursPerDay = 24;
  if (const auto hours = figureOf(disk, "power_on_hours"); hours && !isStep) {
    const double days = static_cast<double>(*hours) / kHoursPerDay;
    const auto percent = static_cast<double>(wear->percent);
    if (const auto left = daysLeft(percent, days, percent))
      return format("About %s of operation at the pace of its life so far", yearsText(*left));
  }
  if (isStep && trend.growth > 0) {
    return "Not known yet: its wear has grown by fewer than three steps on these days";
  }
  if (const auto text = byTrend(step)) return *text;
  if (wear->percent == 0) return "Not known yet: no wear so far";
  return trend.isReplacement ? "Not known yet: it has replaced another drive on these days"
                             : "Not known yet: its wear has not changed on these days";
}

std::string valueText(Unit unit, std::int64_t value) {
  if (unit == kBytes) return sizeText(static_cast<double>(value));
  if (unit == kMillidegrees)
    return page::figureText(static_cast<double>(value), "thousandths of a degree Celsius");
  return page::shortNumber(value);
}

void writeDrive(const PageScene& scene, page::HtmlWriter& html, const Disk& disk) {
  const Reading& reading = disk.reading;
  html.begin("h3");
  html.name(reading.name);
  html.end();
  html.begin("dl");
  std::string verdict = disk.verdict.word();
  for (const std::string& reason : disk.verdict.reasons)
    verdict += ", " + reason;
  const bool isGrave = (disk.verdict.problems & kFailing) != 0;
  writeFact(html, "Verdict", verdict,
            disk.verdict.problems == 0 ? "good"
            : isGrave                  ? "bad"
                                       : "warn");
  if (!reading.model.empty()) writeFact(html, "Model", reading.model);
  if (!reading.firmware.empty()) writeFact(html, "Firmware", reading.firmware);
  if (reading.capacity)
    writeFact(html, "Capacity", sizeText(static_cast<double>(*reading.capacity)));
  if (disk.age) writeFact(html, "Read", ageText(*disk.age) + " ago");
  writeFact(html, "Life left", lifetimeText(scene, disk));
  html.end();
  if (const auto wear = wearOf(disk)) {
    const double used = std::clamp(static_cast<double>(wear->percent) / 100, 0.0, 1.0);
    const bool isBound = stepOf(*wear) > 1 && wear->percent <= 100;
    const page::Share shares[] = {{isBound ? "used at most" : "used", used, {}},
                                  {isBound ? "left at least" : "left", 1 - used, {}}};
    page::writeShares(html, format("Wear of %s", reading.name), shares);
  }
  const std::vector<NamedFigure> figures = figuresOf({reading});
  if (figures.empty()) return;
  page::Table table(
      html, format("Figures of %s", reading.name),
      {{"Figure", page::Table::Align::Name}, {"Value", page::Table::Align::Number}, {"Meaning"}});
  for (const NamedFigure& figure : figures) {
    table.row();
    table.cell([&](page::HtmlWriter& cell) { cell.name(figure.name); });
    table.cell(valueText(figure.unit, figure.value));
    table.cell(figure.meaning);
  }
  table.end();
}

}  // namespace

void writeDrives(PageScene& scene) {
  page::HtmlWriter& html = scene.document.section("Drives");
  const auto [disks, faults] = findDisks(scene.context);
  for (const Error& fault : faults) {
    scene.context.fail(fault.message);
    html.begin("p", {{"class", "warn"}});
    html.name(fault.message);
    html.end();
  }
  if (disks.empty()) {
    html.element("p", "No drive of this device reports its health.");
    return;
  }
  std::size_t written = 0;
  for (; written < disks.size() && !kDriveLimit.isReached(written, html); ++written)
    writeDrive(scene, html, disks[written]);
  writeLeftOut(html, disks.size() - written, "drive", "tavrelctl disks --all");
}

}  // namespace tavrel
