#include "tools/disks/disks_command.h"

#include <initializer_list>
#include <memory>
#include <nlohmann/json.hpp>
#include <ostream>

#include "base/format.h"
#include "base/iso_date.h"
#include "base/quantity_text.h"
#include "base/text.h"
#include "tools/console/table.h"
#include "tools/disks/disk_list.h"

namespace tavrel {
namespace {

using namespace health;

// The first of the named figures that the drive provides.
const std::int64_t* firstOf(const Disk& disk, std::initializer_list<std::string_view> names) {
  for (const std::string_view name : names) {
    if (const std::int64_t* const value = valueOf(disk.reading.figures, name)) return value;
  }
  return nullptr;
}

std::string percentText(std::int64_t percent) {
  return format("%lld %%", percent);
}

std::string bytesOf(const Disk& disk, std::string_view name) {
  const std::int64_t* const value = firstOf(disk, {name});
  return value ? sizeText(static_cast<double>(*value)) : "-";
}

std::string valueText(Unit unit, std::int64_t value) {
  if (unit == kBytes) return sizeText(static_cast<double>(value));
  if (unit == kMillidegrees) return format("%.1f °C", static_cast<double>(value) / 1000);
  return std::to_string(value);
}

const char* unitName(Unit unit) {
  if (unit == kBytes) return "B";
  if (unit == kMillidegrees) return "mC";
  return unit == kEvents ? "events" : "";
}

Emphasis emphasisOf(const Verdict& verdict) {
  return verdict.problems == 0 ? Emphasis::None : Emphasis::Alarm;
}

void printTable(ToolContext& context, const std::vector<Disk>& disks) {
  constexpr auto kRight = Table::Align::Right;
  Table table({{"DISK", Table::Align::Whole},
               {"MODEL"},
               {"FIRMWARE"},
               {"SIZE", kRight},
               {"WEAR", kRight},
               {"SPARE", kRight},
               {"TEMP", kRight},
               {"WRITTEN", kRight},
               {"READ", kRight},
               {"ERRORS", kRight},
               {"HOURS ON", kRight},
               {"AGE", kRight},
               {"VERDICT", Table::Align::Whole}});
  const auto count = [](const std::int64_t* value) {
    return value ? std::to_string(*value) : std::string("-");
  };
  for (const Disk& disk : disks) {
    const Reading& reading = disk.reading;
    const auto wear = wearOf(disk);
    const std::int64_t* const spare = firstOf(disk, {"spare_pct"});
    const std::int64_t* const temperature = firstOf(disk, {"temperature"});
    table.add({reading.name,
               reading.model,
               reading.firmware,
               reading.capacity ? sizeText(static_cast<double>(*reading.capacity)) : "-",
               wear ? percentText(wear->percent) : "-",
               spare ? percentText(*spare) : "-",
               temperature ? valueText(kMillidegrees, *temperature) : "-",
               bytesOf(disk, "written"),
               bytesOf(disk, "read"),
               count(firstOf(disk, {"media_errors", "bad_sectors", "ecc_failures"})),
               count(firstOf(disk, {"power_on_hours"})),
               disk.age ? ageText(*disk.age) : "-",
               {disk.verdict.word(), emphasisOf(disk.verdict)}});
  }
  table.print(context.page());
  for (const Disk& disk : disks) {
    for (const std::string& reason : disk.verdict.reasons)
      context.out() << printable(disk.reading.name) << ": " << printable(reason) << '\n';
  }
}

void printFigures(ToolContext& context, const std::vector<Disk>& disks) {
  for (const Disk& disk : disks) {
    const std::string from =
        disk.reading.from.empty() ? std::string() : "  from " + disk.reading.from;
    context.out() << '\n' << printable(disk.reading.name + from) << '\n';
    Table table({{""}, {"", Table::Align::Right}, {""}, {""}}, 2);
    for (const NamedFigure& figure : figuresOf({disk.reading})) {
      table.add({figure.name, valueText(figure.unit, figure.value), std::string(figure.source),
                 std::string(figure.meaning)});
    }
    table.print(context.page());
  }
}

Json jsonOf(const Figures& figures) {
  Json json = Json::object();
  for (const Figure& figure : figures)
    json[std::string(figure.kind->name)] = figure.value;
  return json;
}

Json jsonOf(const Disk& disk, bool showsSources) {
  const Reading& reading = disk.reading;
  const auto time = plist::Date::since1970(static_cast<double>(reading.time));
  Json json = {{"name", reading.name},
               {"kind", nameOf(reading.kind)},
               {"model", reading.model},
               {"firmware", reading.firmware},
               {"capacity_bytes", reading.capacity ? Json(*reading.capacity) : Json(nullptr)},
               {"time", disk.age ? Json(isoDateText(time)) : Json(nullptr)},
               {"age_seconds", disk.age ? Json(*disk.age) : Json(nullptr)},
               {"from", reading.from},
               {"error", reading.error.empty() ? Json(nullptr) : Json(reading.error)},
               {"verdict", disk.verdict.word()},
               {"problems", disk.verdict.problems},
               {"reasons", disk.verdict.reasons},
               {"figures", jsonOf(reading.figures)},
               {"growth", jsonOf(reading.growth)}};
  if (!showsSources) return json;
  Json sources = Json::array();
  for (const NamedFigure& figure : figuresOf({reading})) {
    sources.push_back({{"name", figure.name},
                       {"value", figure.value},
                       {"unit", unitName(figure.unit)},
                       {"source", figure.source},
                       {"meaning", figure.meaning}});
  }
  json["sources"] = std::move(sources);
  return json;
}

void showDisks(ToolContext& context, bool showsSources) {
  const auto [disks, faults] = findDisks(context);
  for (const Error& fault : faults)
    context.fail(fault.message);
  int status = context.exitStatus();
  for (const Disk& disk : disks)
    status |= disk.verdict.problems;
  if (context.json()) {
    Json list = Json::array();
    for (const Disk& disk : disks)
      list.push_back(jsonOf(disk, showsSources));
    context.printJson({{"disks", std::move(list)}});
  } else if (disks.empty()) {
    context.out() << "no drive reports its health\n";
  } else {
    printTable(context, disks);
    if (showsSources) printFigures(context, disks);
  }
  context.out().flush();
  if (!context.out()) status |= kExitFailure;
  context.setExitStatus(status);
}

}  // namespace

void addDisksCommand(Command app, ToolContext& context) {
  struct Arguments {
    bool all = false;
  };
  const auto arguments = std::make_shared<Arguments>();
  const Command command = app.addCommand("disks", "Show the health of the drives");
  command.addFlag("--all", arguments->all, "Also show each figure with its source and meaning");
  context.addJsonOption(command);
  command.setFooter(
      "Exit status, the sum of: 1 a reading is unusable; 4 a drive was not read; 8 failing; 16 "
      "worn; "
      "32 has errors; 64 its reading is old. 2 means wrong usage.");
  command.onRun([&context, arguments] { showDisks(context, arguments->all); });
}

}  // namespace tavrel
