#include "tools/report/report_commands.h"

#include <algorithm>
#include <chrono>
#include <memory>
#include <nlohmann/json.hpp>
#include <ostream>
#include <string_view>
#include <thread>
#include <utility>

#include "base/format.h"
#include "base/parse_number.h"
#include "ioreport/ioreport.h"
#include "tools/console/table.h"
#include "tools/report/report_delta.h"
#include "tools/report/report_json.h"
#include "tools/report/report_sampler.h"
#include "tools/report/report_selection.h"
#include "tools/report/report_view.h"
#include "tools/shared/noting_platform.h"
#include "tools/shared/subcommand.h"

namespace tavrel {
namespace {

constexpr double kLongestInterval = 86'400;  // seconds

struct Arguments {
  ReportSelection selection;
  bool flat = false;
  double interval = 1;
  std::uint32_t count = 1;
  bool delta = false;
  bool channelsOnly = false;
};

void list(ToolContext& context, const Arguments& arguments) {
  NotingPlatform noting(context);
  const auto channels = selectedChannels(context, noting, arguments.selection);
  if (!channels) return context.fail(channels.error().message);
  if (context.json()) {
    JsonList list(context.out(), Json::object(), "channels");
    addChannels(list, *channels);
    return list.end();
  }
  const bool hasComplained = noting.hasErrors() || noting.hasPrinted();
  if (IOReportGetChannelCount(*channels) == 0 && hasComplained) return;
  printChannels(context.page(), *channels, arguments.flat);
}

void printOne(ToolContext& context, const Arguments& arguments, const plist::Dictionary& samples,
              std::uint32_t number, std::int32_t missing) {
  if (context.json()) {
    // When there are several samples, each is one line, so that readers can see where one ends.
    JsonList list(
        context.out(), {{"sample", number}, {"delta", arguments.delta}, {"missing", missing}},
        "channels", arguments.count == 1 ? JsonList::Layout::Document : JsonList::Layout::Line);
    addSamples(list, samples, arguments.delta);
    list.end();
  } else {
    if (number > 1) context.out() << '\n';
    if (arguments.count > 1) {
      const char* const what = arguments.delta ? "Change" : "Sample";
      context.out() << format("%s %u of %u\n", what, number, arguments.count);
    }
    printSamples(context.page(), samples, arguments.delta);
  }
  context.out().flush();
}

// Computes deltas, leaving out channels that have none. When the number of those changes, a
// note names the first one.
class Changes {
 public:
  explicit Changes(ToolContext& context) : context_(context) {}

  plist::Dictionary between(const plist::Dictionary& previous, const plist::Dictionary& current) {
    const SampleChanges delta = changesBetween(previous, current);
    if (delta.leftOut != std::exchange(leftOut_, delta.leftOut) && delta.leftOut > 0) {
      context_.note(format("%s left out, as the change is unknown; the first is %s",
                           counted(delta.leftOut, "channel"), delta.firstLeftOut));
    }
    return delta.samples;
  }

 private:
  ToolContext& context_;
  std::size_t leftOut_ = 0;
};

void sample(ToolContext& context, const Arguments& arguments) {
  Sampler sampler(context, arguments.selection);
  if (!sampler) return;
  const std::chrono::duration<double> interval(arguments.interval);
  plist::Dictionary previous;
  Changes changes(context);
  std::int32_t reported = 0;
  for (std::uint32_t number = arguments.delta ? 0 : 1; number <= arguments.count; ++number) {
    if (number > (arguments.delta ? 0U : 1U)) std::this_thread::sleep_for(interval);
    const plist::Dictionary samples = sampler.sample();
    if (!samples) return;
    const std::int32_t missing = sampler.missing(samples);
    if (missing != reported) {
      context.note(missing == 0 ? "all channels have values again"
                                : format("%s without values: %s",
                                         counted(static_cast<std::uint64_t>(missing), "channel"),
                                         sampler.reasonForMissing()));
      reported = missing;
    }
    const plist::Dictionary shown = previous ? changes.between(previous, samples) : samples;
    if (number > 0) printOne(context, arguments, shown, number, missing);
    if (!context.out()) return;
    if (arguments.delta) previous = samples;
  }
}

// Prints the system's own text, which does not always end with a line end.
void print(ToolContext& context, const std::optional<std::string>& description) {
  if (!description) return;
  // Names come from drivers, so terminal control characters are escaped, but not
  // the text's own line ends.
  std::string_view rest = *description;
  while (!rest.empty()) {
    const std::size_t end = std::min(rest.find('\n'), rest.size());
    context.out() << printable(rest.substr(0, end)) << '\n';
    rest.remove_prefix(std::min(end + 1, rest.size()));
  }
}

void describe(ToolContext& context, const Arguments& arguments) {
  if (arguments.channelsOnly) {
    NotingPlatform noting(context);
    const auto channels = selectedChannels(context, noting, arguments.selection);
    if (!channels) return context.fail(channels.error().message);
    for (const plist::Dictionary& channel : channelsIn(*channels))
      print(context, IOReportChannelCopyDescription(channel, 0, nullptr));
    return;
  }
  Sampler sampler(context, arguments.selection);
  if (!sampler) return;
  const plist::Dictionary samples = sampler.sample();
  for (const plist::Dictionary& channel : channelsIn(samples)) {
    print(context, IOReportChannelCopyDescription(channel, 0, nullptr));
    const auto description = IOReportSampleCopyDescription(channel, 0, "  ");
    print(context, description ? description : "  (no description)");
  }
}

// What is wrong with an option's text; empty when nothing is.
std::string secondsFault(const std::string& text) {
  const auto seconds = parseNumber<double>(text);
  if (seconds && *seconds >= 0 && *seconds <= kLongestInterval) return {};
  return format("not a number of seconds: %s: give 0 to 86400, such as 0.5", text);
}

Command addSelecting(Command group, const char* name, const char* description,
                     const std::shared_ptr<Arguments>& arguments, ToolContext& context,
                     void (*action)(ToolContext&, const Arguments&)) {
  const Command command = addCommand(group, name, description, arguments, context, action);
  addSelectionOptions(command, arguments->selection);
  return command;
}

}  // namespace

void addReportCommands(Command app, ToolContext& context) {
  const Command group = app.addGroup("report", "List and sample the report channels of drivers");
  const auto arguments = std::make_shared<Arguments>();

  const Command listed = addSelecting(group, "list", "List channels by driver, group and subgroup",
                                      arguments, context, list);
  listed.addFlag("--flat", arguments->flat, "A table, one line per channel");
  context.addJsonOption(listed);

  const Command sampled =
      addSelecting(group, "sample", "Show the values of channels", arguments, context, sample);
  sampled.addOption("--interval", arguments->interval, "Seconds between samples (default 1)")
      .typeName("S")
      .check(secondsFault);
  sampled.addOption("--count", arguments->count, "How many samples (default 1)")
      .typeName("N")
      .check([](const std::string& text) { return countFault(text, "samples"); });
  sampled.addFlag("--delta", arguments->delta, "Show what changed since the previous sample");
  context.addJsonOption(sampled);

  const Command described = addSelecting(group, "describe", "Print the system's own descriptions",
                                         arguments, context, describe);
  described.addFlag("--channels", arguments->channelsOnly, "Of the channels only, not of values");
}

}  // namespace tavrel
