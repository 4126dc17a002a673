#include "tools/stat/stat_commands.h"

#include <charconv>
#include <cmath>
#include <limits>
#include <memory>
#include <nlohmann/json.hpp>
#include <ostream>
#include <vector>

#include "base/arithmetic.h"
#include "base/civil_time.h"
#include "base/format.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/store/sqlite_store.h"
#include "platform/platform.h"
#include "tools/shared/day_argument.h"
#include "tools/shared/table.h"
#include "tools/stat/collect.h"
#include "tools/stat/import_lines.h"
#include "tools/stat/import_number.h"
#include "tools/stat/stat_fold.h"
#include "tools/stat/stat_list.h"
#include "tools/stat/stat_show.h"
#include "tools/stat/stat_transfer.h"

namespace tavrel {
namespace {

struct Arguments {
  std::string file = "-";
  std::string key;
  std::string number;
  std::vector<std::string> values;
  std::string day;
  std::uint32_t seconds = 5;
  std::optional<std::uint32_t> days;
};

// Changes the store in one transaction.
template <class Change>
void change(ToolContext& context, Change change) {
  auto batch = context.linuxPlatform().store().beginBatch();
  if (!batch) return context.fail(batch.error().message);
  Status done = change(**batch);
  if (done) done = (*batch)->commit();
  if (!done) context.fail(done.error().message);
}

// A key that the export could not write is a mistake. False after a message that says so.
bool checkKey(ToolContext& context, const std::string& key) {
  if (isExportable(key)) return true;
  context.failUsage(format("not a key: %s: give UTF-8 text without tabs and line ends",
                           key.empty() ? "\"\"" : std::string_view(key).substr(0, 60)));
  return false;
}

// Sets or adds to today's value of a scalar.
template <Status (SqliteBatch::*operation)(std::int32_t, std::string_view, std::int64_t)>
void changeScalar(ToolContext& context, const Arguments& arguments) {
  if (!checkKey(context, arguments.key)) return;
  std::int64_t number = 0;
  const char* const end = arguments.number.data() + arguments.number.size();
  const auto [stop, error] = std::from_chars(arguments.number.data(), end, number);
  if (error != std::errc() || stop != end) {
    return context.failUsage(format("not a 64-bit integer: %s", arguments.number));
  }
  const std::int32_t today = context.platform().statistics->BHDaysSince1970();
  change(context,
         [&](SqliteBatch& batch) { return (batch.*operation)(today, arguments.key, number); });
}

void record(ToolContext& context, const Arguments& arguments) {
  if (!checkKey(context, arguments.key)) return;
  std::vector<double> values;
  for (const std::string& text : arguments.values) {
    const auto value = parseExactDouble(text);
    if (!value) return context.failUsage(value.error().message);
    values.push_back(*value);
  }
  const std::int32_t today = context.platform().statistics->BHDaysSince1970();
  const double now = context.platform().clock->now().secondsSince1970();
  const std::uint32_t seconds = secondOfDay(saturatingInt64(std::floor(now)));
  change(context, [&](SqliteBatch& batch) {
    Status done = Done{};
    for (std::size_t i = 0; done && i < values.size(); ++i) {
      done = batch.appendValue(today, arguments.key, seconds, values[i]);
    }
    return done;
  });
}

// A day from the command line. False, after a message, when it is not one.
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

// What is wrong with the text of --days; nothing when it is good.
std::string daysFault(const std::string& text) {
  std::uint32_t days = 0;
  const auto [end, fault] = std::from_chars(text.data(), text.data() + text.size(), days);
  const bool isNumber = fault == std::errc{} && end == text.data() + text.size();
  if (isNumber && days > 0) return {};
  return format("not a number of days: %s: give 1 or more", text);
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
  import.addOption("FILE", arguments->file,
                   "Kept as a whole or not at all; - is standard input (default)");
  import.setFooter(
      "DAY is today, yesterday, a number or YYYY-MM-DD; SECONDS is 0 to 86399. A scalar replaces\n"
      "that of its day. Values are added to those of their day: importing a file twice doubles\n"
      "them.");
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

  const Command set = addCommand(group, "set", "Set today's value of a scalar", arguments, context,
                                 changeScalar<&SqliteBatch::setScalar>);
  addKey(set, *arguments);
  set.addOption("N", arguments->number, "64-bit integer").required();

  const Command add = addCommand(group, "add", "Add to today's value of a scalar", arguments,
                                 context, changeScalar<&SqliteBatch::addScalar>);
  addKey(add, *arguments);
  add.addOption("N", arguments->number, "64-bit integer").required();

  const Command recorded = addCommand(group, "record", "Append values to today's distribution",
                                      arguments, context, record);
  addKey(recorded, *arguments);
  recorded
      .addOption("VALUE", arguments->values,
                 "Numbers: 2, -1.5, 1e-3, 0x1p-3, inf, nan; put -- before -inf and -nan")
      .required();

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
      addCommand(group, "show", "Show one statistic: its values by day, and what they come to",
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
      context,
      [](ToolContext& tool, const Arguments& given) { collectStatistics(tool, given.seconds); });
  collected.addOption("--seconds", arguments->seconds, "How long to sample (default 5)")
      .typeName("N");
  collected.setFooter(std::string(collectedKeysHelp()));
}

}  // namespace tavrel
