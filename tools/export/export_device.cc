// Drives, and the state of the device as `status --check` sees it.
#include <algorithm>

#include "platform/linux/health/figure.h"
#include "tools/check/check.h"
#include "tools/disks/disk_list.h"
#include "tools/export/exports.h"

namespace tavrel {
namespace {

using namespace health;

// Reading a large store completely would not fit between two scrapes.
constexpr std::chrono::milliseconds kExamination{100};

void exportFigures(const Disk& disk, const Figures& figures, std::string_view ending,
                   MetricPage& page) {
  for (const Figure& figure : figures) {
    const MetricLabels labels{{"disk", disk.reading.name},
                              {"figure", std::string(figure.kind->name).append(ending)}};
    if (figure.kind->unit == kBytes) {
      page.gauge({"tavrel_disk_figure_bytes", "bytes", "Figures of drives: sizes."}, labels,
                 figure.value);
    } else if (figure.kind->unit == kMillidegrees) {
      page.gauge({"tavrel_disk_figure_celsius", "celsius", "Figures of drives: temperatures."},
                 labels, static_cast<double>(figure.value) / 1000);
    } else {
      page.gauge({"tavrel_disk_figure", "", "Figures of drives: all others."}, labels,
                 figure.value);
    }
  }
}

std::string labelName(std::string_view checkName) {
  std::string name(checkName);
  std::ranges::replace(name, '-', '_');
  return name;
}

}  // namespace

void exportDisks(ToolContext& context, MetricPage& page) {
  const auto [disks, faults] = findDisks(context);
  for (const Error& fault : faults)
    context.fail(fault.message);
  for (const Disk& disk : disks) {
    const Reading& reading = disk.reading;
    const MetricLabels name{{"disk", reading.name}};
    page.gauge({"tavrel_disk_info", "", "Model and firmware of drives; the value is 1."},
               {{"disk", reading.name},
                {"kind", std::string(nameOf(reading.kind))},
                {"model", reading.model},
                {"firmware", reading.firmware}},
               std::int64_t{1});
    if (reading.capacity) {
      page.gauge({"tavrel_disk_capacity_bytes", "bytes", "Capacity of drives."}, name,
                 *reading.capacity);
    }
    if (disk.age) {
      page.gauge(
          {"tavrel_disk_reading_timestamp_seconds", "seconds", "When drives were last read."}, name,
          reading.time);
    }
    exportFigures(disk, reading.figures, "", page);
    exportFigures(disk, reading.growth, "_growth", page);
  }
}

void exportChecks(ToolContext& context, MetricPage& page) {
  for (const Check& check : checkDevice(context, kExamination)) {
    MetricLabels labels{{"check", std::string(check.name)}};
    if (!check.subject.empty()) labels.emplace_back("subject", check.subject);
    page.gauge(
        {"tavrel_check_state", "", "State of each check: 0 ok, 1 warning, 2 critical, 3 unknown."},
        labels, static_cast<std::int64_t>(check.state));
    const std::string label = labelName(check.name);
    labels.clear();
    if (!check.subject.empty()) labels.emplace_back(label, check.subject);
    for (const CheckFigure& figure : check.figures) {
      page.gauge({std::string(figure.kind->metric), figure.kind->unit, figure.kind->help}, labels,
                 figure.value);
    }
  }
}

}  // namespace tavrel
