#include "tools/stat/stat_commands.h"

#include <memory>

#include "base/format.h"
#include "base/parse_number.h"
#include "platform/platform.h"
#include "tools/shared/day_argument.h"
#include "tools/stat/collect.h"
#include "tools/stat/machine_statistics.h"
#include "tools/stat/record_commands.h"
#include "tools/stat/stat_fold.h"
#include "tools/stat/stat_list.h"
#include "tools/stat/stat_show.h"
#include "tools/stat/stat_transfer.h"

namespace tavrel {
namespace {

struct Arguments {
  std::string file = "-";
  std::string key;
  std::string day;
  std::uint32_t seconds = 5;
  bool once = false;
  std::optional<std::uint32_t> period;  // seconds
  std::string stateFile;
  std::optional<std::uint32_t> days;
};

// Parses a day from the command line. False, after a message, when it is not one.
bool parseDayOption(ToolContext& context, const std::string& text,
                    std::optional<std::int32_t>& day) {
  if (text.empty()) return true;
  const auto parsed = parseDay(text, context.platform().statistics->BHDaysSince1970());
  if (!parsed) {
    context.failUsage(parsed.error().message);
    return false;
  }
  day = *parsed;
  return true;
}

Command addCommand(Command group, const char* name, const char* description,
                   const std::shared_ptr<Arguments>& arguments, ToolContext& context,
                   void (*action)(ToolContext&, const Arguments&)) {
  const Command command = group.addCommand(name, description);
  command.onRun([&context, arguments, action] { action(context, *arguments); });
  return command;
}

bool isPositiveNumber(const std::string& text) {
  return parseNumber<std::uint32_t>(text).value_or(0) > 0;
}

// What is wrong with the text of --days or --every; empty when nothing is.
std::string daysFault(const std::string& text) {
  if (isPositiveNumber(text)) return {};
  return format("not a number of days: %s: give 1 or more", text);
}

std::string periodFault(const std::string& text) {
  if (isPositiveNumber(text)) return {};
  return format("not a number of seconds: %s: give 1 or more", text);
}

void addKey(Command command, Arguments& arguments) {
  command.addOption("KEY", arguments.key, "Name of the statistic").required();
}

void addSelection(Command command, Arguments& arguments) {
  command.addOption("PREFIX", arguments.key, "Only keys that begin with this");
  command
      .addOption("--day", arguments.day, "Only this day: today, yesterday, a number or YYYY-MM-DD")
      .typeName("DAY");
}

}  // namespace

void addStatCommands(Command app, ToolContext& context) {
  const Command group = app.addGroup("stat", "Statistics that are kept in the store");
  const auto arguments = std::make_shared<Arguments>();

  const Command import = addCommand(
      group, "import",
      "Import lines: scalar<TAB>DAY<TAB>KEY<TAB>INTEGER or "
      "value<TAB>DAY<TAB>KEY<TAB>SECONDS<TAB>DOUBLE",
      arguments, context,
      [](ToolContext& tool, const Arguments& given) { importStatistics(tool, given.file); });
  import
      .addOption("FILE", arguments->file,
                 "Lines to import, all or none; - is standard input (default)")
      .notEmpty();
  import.setFooter(
      "DAY is today, yesterday, a number or YYYY-MM-DD; SECONDS is 0 to 86399. A scalar "
      "replaces\nthe one of its day. Values are added to those of their day: importing a file "
      "twice\ndoubles them.");
  context.addJsonOption(import);

  const Command exported =
      addCommand(group, "export", "Write the content of the store in the form that import reads",
                 arguments, context, [](ToolContext& tool, const Arguments& given) {
                   std::optional<std::int32_t> day;
                   if (parseDayOption(tool, given.day, day)) {
                     exportStatistics(tool, given.key, day);
                   }
                 });
  addSelection(exported, *arguments);

  addRecordCommands(group, context);

  const Command listed =
      addCommand(group, "list", "List the content of the store by day", arguments, context,
                 [](ToolContext& tool, const Arguments& given) {
                   std::optional<std::int32_t> day;
                   if (parseDayOption(tool, given.day, day)) listStatistics(tool, given.key, day);
                 });
  addSelection(listed, *arguments);
  context.addJsonOption(listed);

  const Command folded =
      addCommand(group, "fold", "Move what programs recorded into the store", arguments, context,
                 [](ToolContext& tool, const Arguments&) { foldStatistics(tool); });
  context.addJsonOption(folded);

  const Command shown =
      addCommand(group, "show", "Show one statistic: its values by day, and a summary of them",
                 arguments, context, [](ToolContext& tool, const Arguments& given) {
                   showStatistic(tool, given.key, given.days);
                 });
  addKey(shown, *arguments);
  shown.addOption("--days", arguments->days, "Only the last N days, today included (default: all)")
      .typeName("N")
      .check(daysFault);
  context.addJsonOption(shown);

  const Command collected = addCommand(
      group, "collect", "Sample this machine once a second into today's statistics", arguments,
      context, [](ToolContext& tool, const Arguments& given) {
        if (given.once) return collectOnce(tool, given.stateFile);
        if (given.period) {
          return collectEvery(tool, std::chrono::seconds(*given.period), given.stateFile);
        }
        if (!given.stateFile.empty()) {
          return tool.failUsage("--state needs --once or --every");
        }
        collectStatistics(tool, given.seconds);
      });
  const Option seconds =
      collected.addOption("--seconds", arguments->seconds, "How long to sample (default 5)")
          .typeName("N");
  const Option once =
      collected
          .addFlag("--once", arguments->once,
                   "Take one sample, with rates since the last run with --once or --every")
          .excludes(seconds);
  collected
      .addOption("--every", arguments->period,
                 "Take a sample every N seconds until a signal arrives, continuing from the last "
                 "run with --every or --once")
      .typeName("N")
      .check(periodFault)
      .excludes(seconds)
      .excludes(once);
  collected
      .addOption("--state", arguments->stateFile,
                 "File in which --once and --every leave a reading for the next run (default "
                 "/run/tavrel/collect.state)")
      .typeName("FILE");
  collected.setFooter(std::string(collectedKeysHelp()));
}

}  // namespace tavrel
