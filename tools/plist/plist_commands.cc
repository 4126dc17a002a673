#include "tools/plist/plist_commands.h"

#include <CLI/CLI.hpp>
#include <memory>
#include <ostream>

#include "base/format.h"
#include "platform/plist/binary.h"
#include "platform/plist/xml.h"
#include "tools/shared/input_file.h"
#include "tools/shared/json_value.h"
#include "tools/shared/output_file.h"
#include "tools/shared/value_text.h"

namespace tavrel {
namespace {

struct Arguments {
  std::string file;
  std::string form = "xml";
  std::string output = "-";
};

void show(ToolContext& context, const Arguments& arguments) {
  const auto value = readDocument(context, arguments.file);
  if (!value) return context.fail(value.error().message);
  if (context.json()) {
    return context.printJson({{"type", kindName(*value)}, {"value", jsonOf(*value)}});
  }
  printOutline(context.out(), *value);
}

Expected<std::string> encode(const plist::Value& value, const std::string& form) {
  if (form == "binary") return plist::writeBinary(value);
  if (form == "xml") return plist::writeXml(value);
  return jsonText(jsonOf(value), 2) + '\n';
}

void convert(ToolContext& context, const Arguments& arguments) {
  const auto value = readDocument(context, arguments.file);
  if (!value) return context.fail(value.error().message);
  const auto bytes = encode(*value, arguments.form);
  if (!bytes) {
    return context.fail(
        format("cannot write %s: %s: %s", arguments.form, arguments.file, bytes.error().message));
  }
  const auto written = writeOutput(context, arguments.output, *bytes);
  if (!written) context.fail(written.error().message);
}

}  // namespace

void addPlistCommands(CLI::App& app, ToolContext& context) {
  auto* group = app.add_subcommand("plist", "Read and convert property lists");
  group->require_subcommand(1);
  const auto arguments = std::make_shared<Arguments>();
  const auto addFile = [&](CLI::App& command) {
    command
        .add_option("FILE", arguments->file,
                    "Property list of either encoding, or JSON; - is standard input")
        ->required();
  };

  auto* showCommand = group->add_subcommand("show", "Print a property list for people");
  addFile(*showCommand);
  context.addJsonOption(*showCommand);
  showCommand->callback([&context, arguments] { show(context, *arguments); });

  auto* convertCommand = group->add_subcommand("convert", "Convert a property list");
  addFile(*convertCommand);
  convertCommand->add_option("--to", arguments->form, "The form to write")
      ->capture_default_str()
      ->check(CLI::IsMember({"xml", "binary", "json"}));
  convertCommand
      ->add_option("-o,--output", arguments->output,
                   "File to write, in one step; - is standard output")
      ->capture_default_str();
  convertCommand->callback([&context, arguments] { convert(context, *arguments); });
}

}  // namespace tavrel
