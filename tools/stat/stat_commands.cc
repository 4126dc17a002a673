#include "tools/stat/stat_commands.h"

#include <chrono>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "platform/platform.h"
#include "tools/console/day_argument.h"
#include "tools/console/output_file.h"
#include "tools/shared/subcommand.h"
#include "tools/stat/collect.h"
#include "tools/stat/machine_statistics.h"
#include "tools/stat/record_commands.h"
#include "tools/stat/stat_fold.h"
#include "tools/stat/stat_list.h"
#include "tools/stat/stat_show.h"
#include "tools/stat/stat_transfer.h"

namespace tavrel {
namespace {

struct Selection {
  std::string prefix;
  std::string day;
};

// Calls `show` with the prefix and the day; reports a day that is none.
template <void (*show)(ToolContext&, const std::string&, std::optional<std::int32_t>)>
void showSelected(ToolContext& context, const Selection& selection) {
  if (selection.day.empty()) return show(context, selection.prefix, std::nullopt);
  const auto day = parseDay(selection.day, context.platform().statistics->BHDaysSince1970());
  if (!day) return context.failUsage(day.error().message);
  show(context, selection.prefix, *day);
}

void addSelection(Command command, Selection& selection) {
  command.addOption("PREFIX", selection.prefix, "Only keys that begin with this");
  command
      .addOption("--day", selection.day,
                 "Only this day: today, yesterday, a day number or YYYY-MM-DD")
      .typeName("DAY");
}

void addImport(Command group, ToolContext& context) {
  const auto file = std::make_shared<std::string>("-");
  const Command import = addCommand(group, "import",
                                    "Import lines: scalar<TAB>DAY<TAB>KEY<TAB>INTEGER or "
                                    "value<TAB>DAY<TAB>KEY<TAB>SECONDS<TAB>DOUBLE",
                                    file, context, importStatistics);
  import.addOption("FILE", *file, "Lines to import, all or none; - is standard input (default)")
      .notEmpty();
  import.setFooter(
      "DAY is today, yesterday, a day number or YYYY-MM-DD; SECONDS is 0 to 86399. A scalar "
      "replaces\nthe one of its day. Values are added to those of their day: importing a file "
      "twice\ndoubles them.");
  context.addJsonOption(import);
}

void addExport(Command group, ToolContext& context) {
  const auto selection = std::make_shared<Selection>();
  const Command exported =
      addCommand(group, "export", "Write the content of the store in the form that import reads",
                 selection, context, showSelected<exportStatistics>);
  addSelection(exported, *selection);
}

void addList(Command group, ToolContext& context) {
  const auto selection = std::make_shared<Selection>();
  const Command listed = addCommand(group, "list", "List the content of the store by day",
                                    selection, context, showSelected<listStatistics>);
  addSelection(listed, *selection);
  context.addJsonOption(listed);
}

void addFold(Command group, ToolContext& context) {
  const Command folded = group.addCommand("fold", "Move what programs recorded into the store");
  folded.onRun([&context] { foldStatistics(context); });
  context.addJsonOption(folded);
}

struct ShowArguments {
  std::string key;
  std::optional<std::uint32_t> days;
};

void addShow(Command group, ToolContext& context) {
  const auto arguments = std::make_shared<ShowArguments>();
  const Command shown =
      addCommand(group, "show", "Show one statistic: its values by day, and a summary of them",
                 arguments, context, [](ToolContext& tool, const ShowArguments& given) {
                   showStatistic(tool, given.key, given.days);
                 });
  shown.addOption("KEY", arguments->key, "Name of the statistic").required().notEmpty();
  shown.addOption("--days", arguments->days, "Only the last N days, today included (default: all)")
      .typeName("N")
      .check([](const std::string& text) { return countFault(text, "days"); });
  context.addJsonOption(shown);
}

struct CollectArguments {
  std::uint32_t seconds = 5;
  bool once = false;
  std::optional<std::uint32_t> period;  // seconds
  std::string stateFile;
};

void collect(ToolContext& context, const CollectArguments& arguments) {
  if (!arguments.stateFile.empty()) {
    if (!arguments.once && !arguments.period)
      return context.failUsage("--state needs --once or --every");
    if (const Status found = checkFolder(arguments.stateFile); !found) {
      return context.fail(found.error().message);
    }
  }
  if (arguments.once) return collectOnce(context, arguments.stateFile);
  if (arguments.period) {
    return collectEvery(context, std::chrono::seconds(*arguments.period), arguments.stateFile);
  }
  collectStatistics(context, arguments.seconds);
}

void addCollect(Command group, ToolContext& context) {
  const auto arguments = std::make_shared<CollectArguments>();
  const Command collected =
      addCommand(group, "collect", "Sample this machine once a second into today's statistics",
                 arguments, context, collect);
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
      .check([](const std::string& text) { return countFault(text, "seconds"); })
      .excludes(seconds)
      .excludes(once);
  collected
      .addOption("--state", arguments->stateFile,
                 "File in which --once and --every leave a reading for the next run (default "
                 "/run/tavrel/collect.state)")
      .typeName("FILE");
  collected.setFooter(std::string(collectedKeysHelp()));
}

}  // namespace

void addStatCommands(Command app, ToolContext& context) {
  const Command group = app.addGroup("stat", "Statistics that are kept in the store");
  addImport(group, context);
  addExport(group, context);
  addRecordCommands(group, context);
  addList(group, context);
  addFold(group, context);
  addShow(group, context);
  addCollect(group, context);
}

}  // namespace tavrel
