#include "fleet/commands/question.h"

#include <algorithm>
#include <cmath>
#include <nlohmann/json.hpp>

#include "base/ascii.h"
#include "base/civil_time.h"
#include "base/parse_number.h"
#include "fleet/questions/day_range.h"
#include "fleet/questions/grouping.h"
#include "tools/console/table.h"
#include "tools/console/value_text.h"

namespace tavrel::fleet {

namespace {

std::size_t devicesAtLeastOf(const QuestionOptions& options) {
  const std::size_t wanted = options.devicesAtLeast.value_or(kDefaultDevicesAtLeast);
  if (wanted < kFewestDevicesAtLeast) {
    throw UsageError("--devices-at-least: " + std::to_string(wanted) +
                     " is too few: in groups of fewer than " +
                     std::to_string(kFewestDevicesAtLeast) +
                     " devices, one owner can work out the figures of another");
  }
  return wanted;
}

}  // namespace

void addQuestionOptions(Command command, QuestionOptions& options) {
  command
      .addOption("--days", options.days,
                 "FIRST..LAST, one day, or a number of days up to the newest (default: all)")
      .typeName("DAYS");
  command
      .addOption("--devices-at-least", options.devicesAtLeast,
                 "Show no group of fewer devices (default 10, at least 3)")
      .typeName("K");
}

Option addFormOptions(Command command, FleetContext& context, QuestionOptions& options) {
  const Option json = context.addJsonOption(command);
  command.addFlag("--csv", options.csv, "Print comma-separated values").excludes(json);
  return json;
}

Question::Question(FleetContext& context, const QuestionOptions& options)
    : engine_(context.openDatabase(OpenMode::Read)),
      table_(*engine_),
      ledger_(table_, devicesAtLeastOf(options)),
      versions_(shownVersions(ledger_, {})) {
  if (table_.size() == 0) {
    throw EngineError(databaseName(context.database()) +
                      ": holds no logs: load some with tavrel-fleet load");
  }
  if (!options.days.empty()) {
    try {
      days_ = readDays(options.days);
    } catch (const UsageError& error) {
      throw UsageError("--days: " + std::string(error.what()));
    }
  }
}

std::optional<DayRange> Question::readDays(std::string_view text) const {
  // One device with a wrong clock must not decide which days are the newest.
  std::optional<std::int32_t> newest;
  for (const LogTable::Day& day : table_.days()) {
    if (day.end - day.begin >= ledger_.devicesAtLeast()) newest = day.day;
  }
  const auto days = parseDayRange(text, newest.value_or(0));
  if (!days) throw UsageError(days.error().message);
  if (!newest && parseNumber<std::uint32_t>(text)) return std::nullopt;
  return *days;
}

namespace {

// "4.1" is not a part of "4.10" or "14.1".
bool hasPart(std::string_view version, std::string_view part) {
  if (part.empty()) return false;
  for (std::size_t at = 0; (at = version.find(part, at)) != std::string_view::npos; ++at) {
    const std::size_t end = at + part.size();
    const bool cutsBefore = at > 0 && isDigit(version[at - 1]) && isDigit(part.front());
    const bool cutsAfter = end < version.size() && isDigit(version[end]) && isDigit(part.back());
    if (!cutsBefore && !cutsAfter) return true;
  }
  return false;
}

}  // namespace

std::string Question::readVersion(std::string_view text) const {
  const std::string* found = nullptr;
  for (const std::string& version : versions_) {
    if (version == text) return version;
  }
  for (const std::string& version : versions_) {
    if (!hasPart(version, text)) continue;
    if (found != nullptr) {
      throw std::runtime_error("version \"" + printable(text) +
                               "\" is part of several versions: write one of them in full");
    }
    found = &version;
  }
  if (found == nullptr && std::ranges::all_of(table_.texts(Attribute::Os), &std::string::empty)) {
    throw std::runtime_error(
        "no log says its OS version: load the logs with their metadata: see tavrel-fleet(1)");
  }
  if (found == nullptr) {
    throw std::runtime_error("version \"" + printable(text) + "\" " +
                             inFewLogsText(ledger_.devicesAtLeast()) +
                             ": tavrel-fleet summary lists the versions");
  }
  return *found;
}

void ask(FleetContext& context, const QuestionOptions& options,
         const std::function<void(Question& question)>& run) {
  try {
    Question question(context, options);
    run(question);
  } catch (const UsageError& error) {
    context.failUsage(error.what());
  }
}

std::string inFewLogsText(std::size_t devicesAtLeast) {
  return "is in no log, or in logs of fewer than " + std::to_string(devicesAtLeast) + " devices";
}

std::string tooFewText(std::size_t devicesAtLeast) {
  return "fewer than " + std::to_string(devicesAtLeast) + " devices: nothing is shown";
}

std::string joinedText(std::size_t joined, bool hasGroups, std::size_t devicesAtLeast) {
  if (joined == 0) return "";
  const std::string why = "groups of fewer than " + std::to_string(devicesAtLeast) + " devices";
  if (!hasGroups) return "Not divided: the parts would reveal " + why + ".";
  return PartName{PartKind::Other}.text() + " joins " + counted(joined, "group") +
         ", so that nothing reveals " + why + ".";
}

std::string noMeanText() {
  return "NO MEAN counts logs that means and deviations leave out: some of their values are not "
         "finite, or too far apart.";
}

const char* kindText(KeyKind kind) {
  switch (kind) {
    case KeyKind::Scalar:
      return "scalar";
    case KeyKind::Distribution:
      return "distribution";
    case KeyKind::Histogram:
      break;
  }
  return "histogram";
}

const char* kindText(const PartName& name) {
  switch (name.kind) {
    case PartKind::Whole:
      return "all";
    case PartKind::NotReported:
      return "not_reported";
    case PartKind::Other:
      return "other";
    case PartKind::Value:
      break;
  }
  return "value";
}

Json partJson(const PartName& name) {
  return {{"part", kindText(name)}, {"group", name.isValue() ? Json(name.value) : Json(nullptr)}};
}

std::string figureText(double value) {
  return std::isnan(value) ? "-" : shortNumber(value);
}

Json realJson(double value) {
  return std::isfinite(value) ? Json(value) : Json(nullptr);
}

Json daysJson(const DayRange& days) {
  const DayRange all;
  const auto day = [](std::int32_t one, std::int32_t open) {
    return one == open ? Json(nullptr) : Json(dateText(civilFromDays(one)));
  };
  return {{"first", day(days.first, all.first)}, {"last", day(days.last, all.last)}};
}

}  // namespace tavrel::fleet
