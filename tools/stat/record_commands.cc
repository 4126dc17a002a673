#include "tools/stat/record_commands.h"

#include <memory>
#include <vector>

#include "base/format.h"
#include "base/parse_number.h"
#include "tools/shared/subcommand.h"
#include "tools/stat/import_number.h"
#include "tools/stat/value_recorder.h"

namespace tavrel {
namespace {

struct Arguments {
  std::string key;
  std::string number;
  std::vector<std::string> values;
};

// Calls `give` with a recorder and the time, and reports failures.
template <class Give>
void keep(ToolContext& context, Give give) {
  const auto recorder = openRecorder(context);
  if (!recorder) return context.fail(recorder.error().message);
  Status done = give(**recorder, valueTimeNow());
  if (done) done = (*recorder)->keep();
  if (!done) context.fail(done.error().message);
}

// False, after a message, when the key is invalid.
bool checkKey(ToolContext& context, const std::string& key) {
  const std::string fault = keyFault(key);
  if (!fault.empty()) context.failUsage(fault);
  return fault.empty();
}

template <Status (ValueRecorder::*operation)(ValueTime, const std::string&, std::int64_t)>
void changeScalar(ToolContext& context, const Arguments& arguments) {
  if (!checkKey(context, arguments.key)) return;
  // "+5" means what it means for a distribution.
  std::string_view text = arguments.number;
  if (text.starts_with('+') && !text.starts_with("+-")) text.remove_prefix(1);
  const auto number = parseNumber<std::int64_t>(text);
  if (!number) {
    return context.failUsage(format("not a 64-bit integer: %s", arguments.number));
  }
  keep(context, [&](ValueRecorder& recorder, ValueTime now) {
    return (recorder.*operation)(now, arguments.key, *number);
  });
}

void record(ToolContext& context, const Arguments& arguments) {
  if (!checkKey(context, arguments.key)) return;
  std::vector<double> values;
  for (const std::string& text : arguments.values) {
    const auto value = parseExactDouble(text);
    if (!value) return context.failUsage(value.error().message);
    values.push_back(*value);
  }
  keep(context, [&](ValueRecorder& recorder, ValueTime now) {
    Status done = Done{};
    for (std::size_t i = 0; done && i < values.size(); ++i)
      done = recorder.append(now, arguments.key, values[i]);
    return done;
  });
}

Command addRecording(Command group, const char* name, const char* description,
                     const std::shared_ptr<Arguments>& arguments, ToolContext& context,
                     void (*action)(ToolContext&, const Arguments&)) {
  const Command command = addCommand(group, name, description, arguments, context, action);
  command.addOption("KEY", arguments->key, "Name of the statistic").required();
  return command;
}

}  // namespace

void addRecordCommands(Command group, ToolContext& context) {
  const auto arguments = std::make_shared<Arguments>();
  addRecording(
      group, "set",
      "Set today's value of a scalar; other programs' adds since the last fold come on top",
      arguments, context, changeScalar<&ValueRecorder::set>)
      .addOption("N", arguments->number, "64-bit integer")
      .required();
  addRecording(group, "add", "Add to today's value of a scalar", arguments, context,
               changeScalar<&ValueRecorder::add>)
      .addOption("N", arguments->number, "64-bit integer")
      .required();
  addRecording(group, "record", "Append values to today's distribution", arguments, context, record)
      .addOption("VALUE", arguments->values,
                 "Numbers: 2, -1.5, 1e-3, 0x1p-3, inf, nan; put -- before -inf and -nan")
      .required();
}

}  // namespace tavrel
