#include "tools/device/limits_commands.h"

#include <algorithm>
#include <memory>
#include <nlohmann/json.hpp>
#include <ostream>

#include "base/format.h"
#include "base/quantity_text.h"
#include "platform/linux/limits/tidy.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/preferences/file_preferences.h"
#include "tools/console/day_argument.h"
#include "tools/console/table.h"

namespace tavrel {
namespace {

Tidy tidyOf(ToolContext& context, SqliteStore& store) {
  LinuxPlatform& device = context.linuxPlatform();
  Platform& platform = device.platform();
  return {device.root(), device.fileSystem(), platform.propertyLists, context.preferences(), store};
}

Json jsonOfDays(std::int64_t days) {
  return days == kAnyDays ? Json(nullptr) : Json(days);
}

std::string ofBound(const std::string& held, const std::string& bound) {
  return bound.empty() ? held : held + " of " + bound;
}

void showLimits(ToolContext& context) {
  const auto measured = tidyOf(context, context.storeForReading()).measure();
  if (!measured) return context.fail(measured.error().message);
  Table table({{"WHAT", Table::Align::Whole},
               {"DAYS", Table::Align::Right},
               {"SIZE", Table::Align::Right},
               {"ITEMS", Table::Align::Right}});
  Json list = Json::array();
  for (const auto& [kind, bounds, use] : *measured) {
    list.push_back({{"name", kind->name},
                    {"days", use.days},
                    {"days_limit", jsonOfDays(bounds.days)},
                    {"bytes", use.bytes},
                    {"bytes_limit", bounds.bytes},
                    {"items", use.items}});
    const std::string days = bounds.days == kAnyDays ? "" : std::to_string(bounds.days);
    table.add({std::string(kind->label), ofBound(std::to_string(use.days), days),
               ofBound(sizeText(static_cast<double>(use.bytes)),
                       sizeText(static_cast<double>(bounds.bytes))),
               std::to_string(use.items)});
  }
  if (context.json()) return context.printJson({{"limits", std::move(list)}});
  table.print(context.page());
}

// Days in calendar order, with consecutive ones as a range: "3 (…) to 5 (…), 9 (…)".
std::string daysText(std::vector<std::int32_t> days) {
  std::ranges::sort(days);
  std::string text;
  for (auto first = days.begin(); first != days.end();) {
    auto last = first;
    while (last + 1 != days.end() && std::int64_t{*(last + 1)} - *last == 1)
      ++last;
    text += format("%s%s", text.empty() ? "" : ", ", dayText(*first));
    if (last != first) text += format(" to %s", dayText(*last));
    first = last + 1;
  }
  return text;
}

std::string removalText(const TidiedKind& tidied) {
  const auto removed = static_cast<std::uint64_t>(tidied.removed);
  std::string text =
      format("%s: %s removed", tidied.kind->label, counted(removed, tidied.kind->item));
  return tidied.days.empty() ? text : text + ", " + daysText(tidied.days);
}

Json jsonOfRemovals(const TidyReport& report) {
  Json removals = Json::array();
  for (const TidiedKind& tidied : report.kinds) {
    if (tidied.removed == 0) continue;
    Json days = Json::array();
    for (const std::int32_t day : tidied.days)
      days.push_back(day);
    removals.push_back(
        {{"name", tidied.kind->name}, {"removed", tidied.removed}, {"days", std::move(days)}});
  }
  return removals;
}

void tidy(ToolContext& context, bool isQuiet) {
  const TidyReport report = tidyOf(context, context.linuxPlatform().store()).run();
  bool hasRemoved = false;
  for (const TidiedKind& tidied : report.kinds) {
    if (tidied.removed > 0) {
      hasRemoved = true;
      if (!context.json()) context.out() << removalText(tidied) << '\n';
    }
    if (tidied.exceeds) {
      context.note(
          format("%s: what is left exceeds the limits and stays: days that have not been reported "
                 "yet, and what belongs to no day",
                 tidied.kind->label));
    }
  }
  if (context.json()) {
    context.printJson({{"removals", jsonOfRemovals(report)}});
  } else if (!hasRemoved && report.failures.empty() && !isQuiet) {
    context.out() << "nothing to remove\n";
  }
  for (const std::string& failure : report.failures)
    context.fail(failure);
}

}  // namespace

void addLimitsCommand(Command app, ToolContext& context) {
  const Command command =
      app.addCommand("limits", "Show how much the device keeps, beside its limits");
  context.addJsonOption(command);
  command.onRun([&context] { showLimits(context); });
}

void addTidyCommand(Command app, ToolContext& context) {
  const auto isQuiet = std::make_shared<bool>(false);
  const Command command =
      app.addCommand("tidy", "Remove what exceeds the limits, the oldest first");
  command.addFlag("--quiet", *isQuiet, "Print nothing when nothing is removed");
  context.addJsonOption(command);
  command.onRun([&context, isQuiet] { tidy(context, *isQuiet); });
}

}  // namespace tavrel
