#include "tools/log/log_commands.h"

#include <algorithm>
#include <limits>
#include <memory>
#include <nlohmann/json.hpp>
#include <ostream>
#include <vector>

#include "base/arithmetic.h"
#include "base/format.h"
#include "base/limits.h"
#include "base/utf8.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/logs/file_submission.h"
#include "platform/plist/coding.h"
#include "platform/tallied_log.h"
#include "tools/console/day_argument.h"
#include "tools/console/table.h"
#include "tools/log/filed_logs.h"
#include "tools/log/log_conclusion.h"
#include "tools/log/log_document.h"
#include "tools/log/log_faults.h"
#include "tools/log/log_list.h"
#include "tools/log/log_preview.h"
#include "tools/shared/input_file.h"

namespace tavrel {
namespace {

// Showing the day of a log means reading the log.
constexpr std::size_t kShownLogs = 100;

struct Arguments {
  std::string file = "latest";
  std::string day;
  bool raw = false;
  bool all = false;
  bool verbose = false;
};

/// The log that `name` identifies: "latest" (of the daily logs), the name of a filed log or the
/// beginning of one, or a path of this machine.
Expected<LogEnvelope> findLog(ToolContext& context, const std::string& name) {
  if (name != "latest") return logNamed(context, name);
  std::vector<Unseen> unseen;
  const auto latest = newestLog(
      context, kTalliedLogName, [](const FiledLog&) { return true; }, unseen);
  if (!latest) return latest.error();
  // No daily log is withheld, but one that was refused may be the latest.
  const auto refused = std::ranges::find(unseen, FileSubmission::Place::Refused, &Unseen::place);
  if (refused != unseen.end()) {
    if (!*latest) return *refused;
    context.fail(refused->message);
  }
  if (!*latest) {
    const LogConclusion conclusion = concludeOnLogs(context);
    return Error{
        format("no daily log found; %s: %s; 'tavrelctl log preview' shows what a log would contain",
               conclusion.runText(), conclusion.text())};
  }
  return envelopeOf(**latest);
}

bool isNamedAsDaily(const LogEnvelope& envelope) {
  const std::string file = envelope.path.substr(envelope.path.rfind('/') + 1);
  return envelope.metadata.string(kLogMetadataName).value_or(file).starts_with(kTalliedLogName);
}

// Logs of other kinds are texts in their own formats.
void showText(ToolContext& context, const LogEnvelope& envelope, std::string_view bytes) {
  if (context.json()) {
    Json log = jsonOfEnvelope(envelope);
    log["text"] = bytes;
    return context.printJson({{"log", std::move(log)}});
  }
  printEnvelope(context.page(), envelope);
  context.out() << '\n';
  while (!bytes.empty()) {
    const std::size_t end = std::min(bytes.find('\n'), bytes.size());
    context.out() << printable(bytes.substr(0, end)) << '\n';
    bytes.remove_prefix(std::min(end + 1, bytes.size()));
  }
}

void showDocument(ToolContext& context, const LogEnvelope& envelope,
                  const plist::Dictionary& document) {
  if (context.json()) return context.printJson({{"log", jsonOfLog(envelope, document)}});
  printLog(context.page(), envelope, document);
}

void show(ToolContext& context, const Arguments& arguments) {
  auto envelope = findLog(context, arguments.file);
  if (!envelope) return context.fail(envelope.error().message);
  const auto bytes = readInput(context, envelope->path, limits::kPropertyListBytes);
  if (!bytes) return context.fail(bytes.error().message);
  if (envelope->path == "-") envelope->path = "standard input";
  if (arguments.raw) {
    context.out() << *bytes;
    return;
  }
  const auto value = plist::read(asBytes(*bytes));
  if (value && !isTalliedLog(*value)) {
    return context.fail(
        format("not a tallied log: %s: 'tavrelctl plist show FILE' shows it", envelope->path));
  }
  if (value) return showDocument(context, *envelope, value->dictionary());
  if (isNamedAsDaily(*envelope)) {
    return context.fail(
        format("%s is damaged: %s: 'tavrelctl log show --raw FILE' prints its bytes",
               envelope->path, value.error().message));
  }
  if (bytes->empty()) {
    return context.fail(
        format("not a log: %s: it is empty: 'tavrelctl log list' shows the logs", envelope->path));
  }
  if (bytes->find('\0') != std::string::npos || !isValidUtf8(*bytes)) {
    return context.fail(
        format("not a log: %s: it is neither a property list nor text: 'tavrelctl log list' shows "
               "the logs",
               envelope->path));
  }
  showText(context, *envelope, *bytes);
}

plist::Dictionary metadataOf(const LogPreview& preview) {
  plist::Dictionary metadata{{kLogMetadataType, preview.log->type},
                             {kLogMetadataName, preview.log->name},
                             {kLogMetadataVersion, preview.osVersion}};
  if (preview.log->options) metadata.set(kLogMetadataOptions, preview.log->options);
  return metadata;
}

void preview(ToolContext& context, const Arguments& arguments) {
  const std::int32_t today = context.platform().statistics->BHDaysSince1970();
  std::int32_t day = previousDay(today);
  if (!arguments.day.empty()) {
    const auto parsed = parseDay(arguments.day, today);
    if (!parsed) return context.failUsage(parsed.error().message);
    day = *parsed;
  }

  std::function<void(std::string_view, std::string_view)> onLine;
  if (arguments.verbose) {
    onLine = [&context](std::string_view level, std::string_view message) {
      context.error() << level << ": " << printable(message) << '\n';
    };
  }
  const LogPreview preview = previewLog(context, day, onLine);
  // An incomplete document must not pass for a complete one.
  for (const std::string& line : preview.missingValues)
    context.fail(line);
  if (!preview.errors.empty()) context.setExitStatus(kExitFailure);
  if (!arguments.verbose) {
    for (const std::string& error : preview.errors)
      context.note(error);
  }
  if (!preview.log) {
    return context.fail(
        format("no log would be filed for day %s: %s", dayText(day), preview.reason));
  }
  const SubmissionPermission permission = submissionPermission(context.preferences());
  if (permission.isGiven && !permission.covers(day)) {
    context.note(format("not submitted: this is day %s, and submission is %s", dayText(day),
                        textOf(permission)));
  }
  if (!context.json()) {
    context.out() << preview.log->bytes;
    return;
  }
  const auto value = plist::read(asBytes(preview.log->bytes));
  if (!value) return context.fail(format("preview: %s", value.error().message));
  showDocument(context, {"preview", "", metadataOf(preview)}, value->dictionary());
}

}  // namespace

void addLogCommands(Command app, ToolContext& context) {
  const Command group =
      app.addGroup("log", "Show the logs that were filed, and what would be filed");
  const auto arguments = std::make_shared<Arguments>();

  const Command previewCommand = group.addCommand(
      "preview",
      "Print the log that a run would file, with or without permission; changes nothing");
  previewCommand
      .addOption("--day", arguments->day,
                 "today, yesterday (default), a day number or YYYY-MM-DD, UTC")
      .typeName("DAY");
  previewCommand.addFlag("-v,--verbose", arguments->verbose,
                         "Show what the run would write to the system log");
  context.addJsonOption(previewCommand);
  previewCommand.onRun([&context, arguments] { preview(context, *arguments); });

  const Command listCommand =
      group.addCommand("list", "List the logs that wait, are withheld or were refused");
  context.addJsonOption(listCommand);
  listCommand.addFlag("--all", arguments->all, "Show all; without it, the newest 100");
  listCommand.onRun([&context, arguments] {
    listLogs(context, arguments->all ? std::numeric_limits<std::size_t>::max() : kShownLogs);
  });

  const Command showCommand = group.addCommand("show", "Show a log that was filed");
  showCommand
      .addOption("FILE", arguments->file,
                 "A log of 'log list' or the beginning of its name, a path, - for standard input, "
                 "or latest, the last daily one")
      .showDefault()
      .notEmpty();
  const Option raw =
      showCommand.addFlag("--raw", arguments->raw, "Print the log's bytes unchanged");
  raw.excludes(context.addJsonOption(showCommand));
  showCommand.onRun([&context, arguments] { show(context, *arguments); });
}

}  // namespace tavrel
