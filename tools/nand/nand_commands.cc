#include "tools/nand/nand_commands.h"

#include <memory>
#include <nlohmann/json.hpp>
#include <ostream>
#include <string>

#include "base/format.h"
#include "base/limits.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/recorded/recorded_snapshots.h"
#include "platform/linux/recorded/recording_folder.h"
#include "platform/platform.h"
#include "storage/counter_parsers.h"
#include "storage/nand_exporters.h"
#include "storage/nand_info.h"
#include "storage/nand_info_keys.h"
#include "storage/parse/asp_parser.h"
#include "storage/parse/snapshot_record.h"
#include "storage/vm_freezer.h"
#include "tools/console/json_value.h"
#include "tools/console/output_file.h"
#include "tools/console/table.h"
#include "tools/nand/nand_build.h"
#include "tools/nand/nand_counters.h"
#include "tools/nand/nand_derived.h"
#include "tools/nand/nand_snapshot.h"
#include "tools/nand/nand_statistics.h"
#include "tools/nand/nand_view.h"
#include "tools/shared/input_file.h"
#include "tools/shared/noting_platform.h"

namespace tavrel {
namespace {

struct Arguments {
  std::string file;
  std::string other;  // for --diff and --descriptor
  std::string chipId;
  std::string manufacturerId;
  std::string output;
  bool all = false;
};

std::string nameOf(const std::string& file) {
  return file == "-" ? "standard input" : file;
}

// Whether both files are standard input, which can be read only once; if so, reports that.
bool namesInputTwice(ToolContext& context, const Arguments& arguments) {
  if (arguments.file != "-" || arguments.other != "-") return false;
  context.failUsage("standard input can be read only once: give - for one of the files");
  return true;
}

Expected<std::string> readBuffer(ToolContext& context, const std::string& file) {
  return readInput(context, file, limits::kDeviceAllocationBytes);
}

void info(ToolContext& context, const Arguments& arguments) {
  NotingPlatform noting(context);
  const plist::Dictionary info = CopyNANDInfo(noting.platform());
  const bool failed = info.contains(kNANDInfoErrorKey);
  if (context.json()) {
    Json document = jsonOf(info);
    if (!failed) document["derived"] = jsonOf(NandDerived(info));
    context.printJson(std::move(document));
  } else if (!failed) {
    printNandInfo(context.page(), info, arguments.all);
  }
  if (!failed) return;
  const NandExporter* exporter = nullptr;
  const bool hasDriver = findNandExporter(noting.platform().drivers, exporter) != nullptr;
  const std::string advice = hasDriver
                                 ? "see what the driver answers with 'tavrelctl registry show ID'"
                                 : format(
                                       "no storage driver is recorded in %s; see 'tavrelctl "
                                       "disks' for this machine's drives",
                                       context.root().path(kRecordingFolder));
  context.fail(format("no NAND information: %s: %s",
                      info.string(kNANDInfoErrorMessageKey).value_or(""), advice));
}

// A buffer that cannot be parsed is a failure, but the part before the
// fault is still worth showing.
int parseInto(ToolContext& context, const std::string& file, std::string_view bytes,
              ASPContext& statistics) {
  const int result = ASPParseBufferToCxt(statistics, asBytes(bytes));
  if (result == 0) {
    const auto fault = faultOfStatistics(asBytes(bytes));
    context.fail(format("%s is not a complete statistics buffer: %s: fetch or build it again",
                        nameOf(file), fault ? *fault : "it has more values than can be listed"));
  } else if (const std::size_t surplus = bytes.size() % 8; surplus != 0) {
    context.note(format("%s: the last %zu bytes are less than a unit of 8 and were skipped",
                        nameOf(file), surplus));
  }
  return result;
}

void parse(ToolContext& context, const Arguments& arguments) {
  const auto bytes = readBuffer(context, arguments.file);
  if (!bytes) return context.fail(bytes.error().message);
  ASPContext statistics;
  const int result = parseInto(context, arguments.file, *bytes, statistics);
  const ByteSpan buffer = asBytes(*bytes);
  if (context.json()) return printStatisticsJson(context.out(), result, statistics, buffer);
  if (const auto unlisted = printStatistics(context.page(), statistics, buffer); unlisted > 0) {
    context.note(
        format("%s: %s not listed in full (unknown statistics, no values or too many): --json "
               "prints them in full",
               nameOf(arguments.file), counted(unlisted, "record")));
  }
}

void compare(ToolContext& context, const Arguments& arguments) {
  if (namesInputTwice(context, arguments)) return;
  const auto first = readBuffer(context, arguments.file);
  if (!first) return context.fail(first.error().message);
  const auto second = readBuffer(context, arguments.other);
  if (!second) return context.fail(second.error().message);
  ASPContext before, after;
  const int firstResult = parseInto(context, arguments.file, *first, before);
  const int secondResult = parseInto(context, arguments.other, *second, after);
  const auto differences = differencesBetween(before, after);
  if (context.json()) {
    return context.printJson({{"results", {firstResult, secondResult}},
                              {"differences", jsonOfDifferences(differences)}});
  }
  printDifferences(context.page(), differences);
}

void counters(ToolContext& context, const Arguments& arguments) {
  const auto bytes = readBuffer(context, arguments.file);
  if (!bytes) return context.fail(bytes.error().message);
  if (bytes->size() != kCounterBlockBytes) {
    return context.fail(
        format("%s is not a counter block: it has %zu bytes, and a block has %zu: cut "
               "one out with dd bs=%zu count=1 skip=CHANNEL",
               nameOf(arguments.file), bytes->size(), kCounterBlockBytes, kCounterBlockBytes));
  }
  NotingStreams streams(context);
  const ManufacturerId id = readManufacturerId(streams, arguments.manufacturerId);
  const CounterParser parser =
      selectCounterParser(chipGeneration(arguments.chipId), id.vendor, id.device);
  TelemetryCounters record;
  parser(asBytes(*bytes).first<kCounterBlockBytes>(), record);
  const std::string_view name = counterParserName(parser);
  if (context.json()) return context.printJson(jsonOfCounters(name, record));
  printCounters(context.page(), name, record);
}

// Key and formats come from a device, so what acts on a terminal is escaped, but not the layout.
void printText(std::ostream& out, std::string_view text) {
  while (!text.empty()) {
    const std::size_t end = std::min(text.find_first_of("\n\t"), text.size());
    out << printable(text.substr(0, end)) << text.substr(end, 1);
    text.remove_prefix(std::min(end + 1, text.size()));
  }
}

void snapshot(ToolContext& context, const Arguments& arguments) {
  if (namesInputTwice(context, arguments)) return;
  const auto records = readBuffer(context, arguments.file);
  if (!records) return context.fail(records.error().message);
  std::string descriptor;
  const bool hasDescriptor = !arguments.other.empty();
  if (!hasDescriptor && records->size() < kSnapshotRecordBytes) {
    return context.fail(format(
        "%s has no complete record: it has %zu bytes, and a record has %zu: give a timeline of the "
        "controller, and --descriptor if one came with it",
        nameOf(arguments.file), records->size(), kSnapshotRecordBytes));
  }
  if (hasDescriptor) {
    auto bytes = readBuffer(context, arguments.other);
    if (!bytes) return context.fail(bytes.error().message);
    descriptor = *std::move(bytes);
  }
  const auto text = renderSnapshots(
      asBytes(*records), hasDescriptor ? std::optional(asBytes(descriptor)) : std::nullopt);
  if (!text) {
    return context.fail(format("cannot render %s: %s",
                               nameOf(hasDescriptor ? arguments.other : arguments.file),
                               text.error().message));
  }
  if (const std::size_t surplus = records->size() % kSnapshotRecordBytes;
      !hasDescriptor && surplus > 0) {
    context.note(format("%s: the last %zu bytes are less than a record of %zu and were skipped",
                        nameOf(arguments.file), surplus, kSnapshotRecordBytes));
  }
  printText(context.out(), *text);
}

void freezer(ToolContext& context, const Arguments& arguments) {
  plist::Dictionary info;
  if (arguments.file.empty()) {
    NotingPlatform noting(context);
    info = CopyVMFreezerNANDInfo(noting.platform().stackSnapshots);
  } else {
    const auto bytes = readBuffer(context, arguments.file);
    if (!bytes) return context.fail(bytes.error().message);
    TakenSnapshot taken(asBytes(*bytes));
    info = CopyVMFreezerNANDInfo(taken);
  }
  const bool failed = info.contains(kNANDInfoVMFreezerErrorKey);
  if (context.json()) {
    context.printJson(jsonOf(info));
  } else if (!failed) {
    printNandInfo(context.page(), info, true);
  }
  if (!failed) return;
  std::string message(info.string(kNANDInfoVMFreezerErrorMessageKey).value_or(""));
  if (message.ends_with('.')) message.pop_back();
  if (!arguments.file.empty()) {
    return context.fail(
        format("%s: %s: give a stack snapshot whose first container holds the "
               "thread VM_swapout, with complete IO statistics if it has any",
               nameOf(arguments.file), message));
  }
  context.fail(
      format("no freezer writes: %s: put a stack snapshot whose first container holds the "
             "thread VM_swapout, with complete IO statistics if it has any, at %s",
             message, context.root().path(kRecordedSnapshot)));
}

void build(ToolContext& context, const Arguments& arguments) {
  const auto document = readDocument(context, arguments.file);
  if (!document) return context.fail(document.error().message);
  const auto bytes = buildStatistics(*document);
  if (!bytes) {
    return context.fail(format("%s: %s", nameOf(arguments.file), bytes.error().message));
  }
  const auto written = writeOutput(context, arguments.output, *bytes);
  if (!written) context.fail(written.error().message);
}

}  // namespace

void addNandCommands(Command app, ToolContext& context) {
  const Command group = app.addGroup("nand", "Inspect the flash storage and its raw buffers");
  const auto arguments = std::make_shared<Arguments>();
  const auto addFile = [&](Command command, const char* what) {
    return command.addOption("FILE", arguments->file, what).notEmpty();
  };

  const Command infoCommand = group.addCommand("info", "Show the health of the flash");
  infoCommand.addFlag("--all", arguments->all, "Show the figures that are 0 too");
  context.addJsonOption(infoCommand);
  infoCommand.onRun([&context, arguments] { info(context, *arguments); });

  const Command parseCommand = group.addCommand("parse", "Show every statistic of a raw buffer");
  addFile(parseCommand, "Statistics buffer; - is standard input").required();
  parseCommand.addOption("--diff", arguments->other, "Show what differs in this later buffer")
      .typeName("FILE2");
  context.addJsonOption(parseCommand);
  parseCommand.onRun([&context, arguments] {
    if (arguments->other.empty()) {
      parse(context, *arguments);
    } else {
      compare(context, *arguments);
    }
  });

  const Command countersCommand =
      group.addCommand("counters", "Show the counters of a NAND chip's block");
  addFile(countersCommand, "Counter block of 4096 bytes; - is standard input").required();
  countersCommand.addOption("--chip-id", arguments->chipId, "The controller's, such as K3V")
      .typeName("ID")
      .required();
  countersCommand
      .addOption("--manufacturer-id", arguments->manufacturerId,
                 "The controller's: 12 hexadecimal digits")
      .typeName("ID")
      .required();
  context.addJsonOption(countersCommand);
  countersCommand.onRun([&context, arguments] { counters(context, *arguments); });

  const Command snapshotCommand =
      group.addCommand("snapshot", "Render the controller's timeline as text");
  addFile(snapshotCommand, "Snapshot records; - is standard input").required();
  snapshotCommand
      .addOption("--descriptor", arguments->other,
                 "The descriptor of the records (default: the fixed layout)")
      .typeName("FILE");
  snapshotCommand.onRun([&context, arguments] { snapshot(context, *arguments); });

  const Command freezerCommand =
      group.addCommand("freezer", "Show the flash writes of the memory freezer");
  addFile(freezerCommand, "Stack snapshot (default: the device's); - is standard input");
  context.addJsonOption(freezerCommand);
  freezerCommand.onRun([&context, arguments] { freezer(context, *arguments); });

  const Command buildCommand = group.addCommand("build", "Make a statistics buffer from JSON");
  addFile(buildCommand, "Its entries, as nand parse --json prints them; - is standard input")
      .required();
  buildCommand.addOption("-o,--output", arguments->output, "File to write; - is standard output")
      .typeName("FILE")
      .required();
  buildCommand.onRun([&context, arguments] { build(context, *arguments); });
}

}  // namespace tavrel
