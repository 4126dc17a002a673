#include "tools/whitelist/whitelist_commands.h"

#include <algorithm>
#include <iterator>
#include <memory>
#include <nlohmann/json.hpp>
#include <ostream>

#include "base/format.h"
#include "base/limits.h"
#include "base/text.h"
#include "config/bh_config.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/linux_platform.h"
#include "platform/plist/coding.h"
#include "tools/console/table.h"
#include "tools/shared/input_file.h"
#include "tools/whitelist/whitelist_check.h"
#include "tools/whitelist/whitelist_data.h"
#include "tools/whitelist/whitelist_diff.h"
#include "tools/whitelist/whitelist_explain.h"

namespace tavrel {
namespace {

struct Arguments {
  std::string file;  // empty: the device's own
  std::string files[2];
  std::vector<std::string> keys;
  std::string value;
};

struct Whitelist {
  std::string name;  // of the file
  std::string bytes;
  plist::Value value;
};

Expected<Whitelist> readWhitelist(ToolContext& context, const std::string& file) {
  const std::string path = file.empty() ? context.root().path(kWhitelistPath) : file;
  // The device's own must be a file, as the daemon requires; any other may be a pipe.
  auto bytes = file.empty()
                   ? context.linuxPlatform().fileSystem().read(path, limits::kWhitelistBytes)
                   : readInput(context, path, limits::kWhitelistBytes);
  if (!bytes) {
    const bool isMissing = file.empty() && !FileSystem::status(path);
    return Error{bytes.error().message + (isMissing ? kWriteWhitelist : "")};
  }
  const std::string name = path == "-" ? "standard input" : path;
  auto value = plist::read(asBytes(*bytes));
  if (!value) return Error{format("%s: %s", name, value.error().message)};
  return Whitelist{name, *std::move(bytes), *std::move(value)};
}

// As for `diff` below: 1 means that there are findings, 2 that it could not look.
void check(ToolContext& context, const Arguments& arguments) {
  context.setFailureStatus(kExitUsage);
  const auto whitelist = readWhitelist(context, arguments.file);
  if (!whitelist) return context.fail(whitelist.error().message);
  auto findings = checkWhitelist(whitelist->value);
  std::ranges::move(checkAgainstData(context, whitelist->value), std::back_inserter(findings));
  if (!findings.empty() && context.exitStatus() == kExitSuccess) {
    context.setExitStatus(kExitFailure);
  }

  std::string digest;
  appendHex(digest, context.platform().digest->md5(asBytes(whitelist->bytes)));
  if (context.json()) {
    Json list = Json::array();
    for (const auto& [path, message] : findings) {
      list.push_back({{"path", path}, {"message", message}});
    }
    return context.printJson(
        {{"file", whitelist->name}, {"digest", digest}, {"findings", std::move(list)}});
  }
  for (const auto& [path, message] : findings) {
    const std::string place = path.empty() ? whitelist->name : path;
    context.out() << printable(place + ": " + message) << '\n';
  }
  if (context.exitStatus() == kExitSuccess) {
    context.out() << printable(whitelist->name) << ": no findings (digest " << digest << ")\n";
  }
}

// Like diff(1), exits with 2 when the files could not be compared.
void diff(ToolContext& context, const Arguments& arguments) {
  context.setFailureStatus(kExitUsage);
  std::vector<Whitelist> both;
  for (const std::string& file : arguments.files) {
    auto whitelist = readWhitelist(context, file);
    if (!whitelist) return context.fail(whitelist.error().message);
    if (!whitelist->value.dictionary()) {
      return context.fail(
          format("%s: not a whitelist: its root must be a dictionary of groups", whitelist->name));
    }
    both.push_back(*std::move(whitelist));
  }
  const WhitelistChanges changes = compareWhitelists(both[0].value, both[1].value);
  if (revealsMore(changes)) context.setExitStatus(kExitFailure);
  if (!context.json()) return printChanges(context.out(), changes);
  Json object = {{"old", both[0].name}, {"new", both[1].name}};
  object.update(jsonOf(changes));
  context.printJson(std::move(object));
}

void explain(ToolContext& context, const Arguments& arguments) {
  std::optional<ExampleValue> example;
  if (!arguments.value.empty()) {
    auto parsed = parseExampleValue(arguments.value);
    if (!parsed) return context.failUsage(parsed.error().message);
    example = *parsed;
  }
  const auto whitelist = readWhitelist(context, arguments.file);
  if (!whitelist) return context.fail(whitelist.error().message);
  const auto explanations = explainKeys(context.linuxPlatform(), whitelist->bytes, whitelist->value,
                                        arguments.keys, example);
  if (!explanations) return context.fail(explanations.error().message);
  if (context.json()) {
    return context.printJson({{"file", whitelist->name}, {"keys", jsonOf(*explanations)}});
  }
  for (const KeyExplanation& explanation : *explanations) {
    printExplanation(context.out(), explanation);
  }
}

}  // namespace

void addWhitelistCommands(Command app, ToolContext& context) {
  const Command group = app.addGroup("whitelist", "Check and explain the whitelist");
  const auto arguments = std::make_shared<Arguments>();

  const Command checkCommand = group.addCommand(
      "check",
      "Report entries that have no effect or do not coarsen; exit status 1 if there are any");
  checkCommand
      .addOption("FILE", arguments->file,
                 "Whitelist (default: the device's own); - is standard input")
      .notEmpty();
  context.addJsonOption(checkCommand);
  checkCommand.onRun([&context, arguments] { check(context, *arguments); });

  const Command diffCommand = group.addCommand(
      "diff", "Compare what two whitelists let out; exit status 1 if NEW lets out more than OLD");
  diffCommand.addOption("OLD", arguments->files[0], "Whitelist; - is standard input")
      .required()
      .notEmpty();
  diffCommand.addOption("NEW", arguments->files[1], "Whitelist; - is standard input")
      .required()
      .notEmpty();
  context.addJsonOption(diffCommand);
  diffCommand.onRun([&context, arguments] { diff(context, *arguments); });

  const Command explainCommand =
      group.addCommand("explain", "Show which rule applies to a key, and its options");
  explainCommand.addOption("KEY", arguments->keys, "Keys of statistics").required().notEmpty();
  explainCommand.addOption("--value", arguments->value, "Also show how this value is coarsened")
      .typeName("NUMBER");
  explainCommand
      .addOption("--file", arguments->file,
                 "Whitelist (default: the device's own); - is standard input")
      .typeName("FILE");
  context.addJsonOption(explainCommand);
  explainCommand.onRun([&context, arguments] { explain(context, *arguments); });
}

}  // namespace tavrel
