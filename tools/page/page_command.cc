#include "tools/page/page_command.h"

#include <memory>
#include <optional>
#include <string>

#include "base/format.h"
#include "base/parse_number.h"
#include "platform/linux/logs/submission_permission.h"
#include "platform/linux/preferences/file_preferences.h"
#include "platform/platform.h"
#include "platform/plist/coding.h"
#include "platform/tallied_log.h"
#include "tools/console/day_argument.h"
#include "tools/console/output_file.h"
#include "tools/log/log_preview.h"
#include "tools/page/sections.h"

namespace tavrel {
namespace {

// The same as for metrics: nobody wants to wait a second for a page.
constexpr std::chrono::milliseconds kExamination{100};
constexpr std::uint32_t kMostDays = 400;

struct Arguments {
  std::string output;
  std::string day;
  std::uint32_t days = 30;
};

PageLog pageLogOf(ToolContext& context, const LogPreview& preview, std::int32_t day) {
  PageLog log;
  log.errors = preview.errors;
  log.errors.insert(log.errors.end(), preview.missingValues.begin(), preview.missingValues.end());
  log.isCovered = submissionPermission(context.preferences()).covers(day);
  if (!preview.log) {
    log.reason = preview.reason;
    return log;
  }
  const auto value = plist::read(asBytes(preview.log->bytes));
  if (!value) {
    log.reason = value.error().message;
    return log;
  }
  log.scalars = value->dictionary().dictionary(kScalarsMember);
  log.distributions = distributionsOf(value->dictionary());
  return log;
}

void makePage(ToolContext& context, const Arguments& arguments) {
  std::optional<std::int32_t> day;
  if (!arguments.day.empty()) {
    const auto parsed = parseDay(arguments.day, context.platform().statistics->BHDaysSince1970());
    if (!parsed) return context.failUsage(parsed.error().message);
    day = *parsed;
  }
  const std::vector<Check> checks = checkDevice(context, kExamination);
  const RecordedDays recorded =
      readRecordedDays(context, day, static_cast<std::int32_t>(arguments.days));
  if (!recorded.fault.empty()) context.fail(recorded.fault);
  const LogPreview preview = previewLog(context, recorded.day);
  const PageLog log = pageLogOf(context, preview, recorded.day);
  for (const std::string& error : log.errors)
    context.failOnce(error);
  if (preview.lacksWhitelist) context.note(preview.reason);

  page::Document document(format("Device on %s", dayDateText(recorded.day)));
  PageScene scene{context, document, recorded, log, preview.osVersion};
  writeHead(scene, checks);
  writeHealth(scene, checks);
  writeScalars(scene);
  writeDistributions(scene);
  writeTrends(scene);
  writeStates(scene);
  writeDrives(scene);
  writeNotes(scene);
  if (const Status written = writeOutput(context, arguments.output, document.text()); !written)
    context.fail(written.error().message);
}

std::string faultOfDays(const std::string& text) {
  const auto days = parseNumber<std::uint32_t>(text);
  if (days && *days >= 1 && *days <= kMostDays) return {};
  return format("takes 1 to %u, not %s", kMostDays, text);
}

}  // namespace

void addPageCommand(Command app, ToolContext& context) {
  const auto arguments = std::make_shared<Arguments>();
  const Command command = app.addCommand("page", "Write one HTML page about the device");
  command
      .addOption("-o,--output", arguments->output,
                 "File to write, in one step; - is standard output")
      .typeName("FILE")
      .required();
  command.addOption("--days", arguments->days, "Days of the trends, at most 400")
      .typeName("N")
      .showDefault()
      .check(faultOfDays);
  command
      .addOption("--day", arguments->day,
                 "The day of the figures: today, yesterday, a day number or YYYY-MM-DD, UTC "
                 "(default: the last day before today with statistics)")
      .typeName("DAY");
  command.onRun([&context, arguments] { makePage(context, *arguments); });
}

}  // namespace tavrel
