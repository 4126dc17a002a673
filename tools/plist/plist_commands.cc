#include "tools/plist/plist_commands.h"

#include <memory>
#include <nlohmann/json.hpp>

#include "base/format.h"
#include "platform/plist/binary.h"
#include "platform/plist/xml.h"
#include "tools/console/json_value.h"
#include "tools/console/output_file.h"
#include "tools/console/typed_value.h"
#include "tools/console/value_text.h"
#include "tools/shared/input_file.h"

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
  const std::string name = arguments.file == "-" ? "standard input" : arguments.file;
  if (arguments.form == "xml" && !hasXmlTextsOnly(*value)) {
    return context.fail(format(
        "cannot write xml: %s: it has text with control characters: use --to binary or --to json",
        name));
  }
  const auto bytes = encode(*value, arguments.form);
  if (!bytes) {
    return context.fail(
        format("cannot write %s: %s: %s", arguments.form, name, bytes.error().message));
  }
  const auto written = writeOutput(context, arguments.output, *bytes);
  if (!written) context.fail(written.error().message);
}

}  // namespace

void addPlistCommands(Command app, ToolContext& context) {
  const Command group = app.addGroup("plist", "Read and convert property lists");
  const auto arguments = std::make_shared<Arguments>();
  const auto addFile = [&](Command command) {
    command
        .addOption("FILE", arguments->file,
                   "Property list of either encoding, or JSON; - is standard input")
        .required()
        .notEmpty();
  };

  const Command showCommand = group.addCommand("show", "Print a property list for people");
  addFile(showCommand);
  context.addJsonOption(showCommand);
  showCommand.onRun([&context, arguments] { show(context, *arguments); });

  const Command convertCommand = group.addCommand("convert", "Convert a property list");
  addFile(convertCommand);
  convertCommand.addOption("--to", arguments->form, "The form to write")
      .showDefault()
      .oneOf({"xml", "binary", "json"});
  convertCommand
      .addOption("-o,--output", arguments->output,
                 "File to write, in one step; - is standard output")
      .typeName("FILE")
      .showDefault();
  convertCommand.onRun([&context, arguments] { convert(context, *arguments); });
}

}  // namespace tavrel
