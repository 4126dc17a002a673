#include "tools/export/export_commands.h"

#include <memory>
#include <optional>
#include <string>

#include "base/version.h"
#include "platform/platform.h"
#include "tools/console/day_argument.h"
#include "tools/console/output_file.h"
#include "tools/export/exports.h"

namespace tavrel {
namespace {

struct Arguments {
  std::string output = "-";
  std::string day;
};

void exportMetrics(ToolContext& context, const Arguments& arguments) {
  std::optional<std::int32_t> day;
  if (!arguments.day.empty()) {
    const auto parsed = parseDay(arguments.day, context.platform().statistics->BHDaysSince1970());
    if (!parsed) return context.failUsage(parsed.error().message);
    day = *parsed;
  }
  MetricPage page;
  page.gauge({"tavrel_build_info", "", "Version of tavrel; the value is 1."},
             {{"version", std::string(version())}}, std::int64_t{1});
  exportChecks(context, page);
  exportDisks(context, page);
  exportChannels(context, page);
  exportStatistics(context, day, page);
  page.gauge({"tavrel_metrics_left_out", "", "Metrics that this page had no room for."}, {},
             static_cast<std::int64_t>(page.leftOut()));
  if (const Status written = writeOutput(context, arguments.output, page.text()); !written)
    context.fail(written.error().message);
}

}  // namespace

void addExportCommands(Command app, ToolContext& context) {
  const Command group = app.addGroup("export", "Write figures in the formats of other programs");
  const auto arguments = std::make_shared<Arguments>();
  const Command metrics = group.addCommand(
      "openmetrics", "Write statistics, channels, drives and tavrel's own state as metrics");
  metrics
      .addOption("-o,--output", arguments->output,
                 "File to write, in one step; - is standard output")
      .typeName("FILE")
      .showDefault();
  metrics
      .addOption("--day", arguments->day,
                 "The day of the statistics: today, yesterday, a day number or YYYY-MM-DD, UTC "
                 "(default: the latest)")
      .typeName("DAY");
  metrics.onRun([&context, arguments] { exportMetrics(context, *arguments); });
}

}  // namespace tavrel
