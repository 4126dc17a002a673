#include "tools/tavrelctl.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <exception>
#include <string_view>

#include "base/version.h"
#include "tools/catalogue/catalogue_command.h"
#include "tools/completion/completion_command.h"
#include "tools/consent/erase_command.h"
#include "tools/consent/permission_commands.h"
#include "tools/console/command_line.h"
#include "tools/device/limits_commands.h"
#include "tools/device/prefs_commands.h"
#include "tools/device/send_commands.h"
#include "tools/device/status_command.h"
#include "tools/device/tasking_commands.h"
#include "tools/disks/disks_command.h"
#include "tools/export/export_commands.h"
#include "tools/log/log_commands.h"
#include "tools/log/nandlog_commands.h"
#include "tools/nand/nand_commands.h"
#include "tools/page/page_command.h"
#include "tools/plist/plist_commands.h"
#include "tools/records/records_commands.h"
#include "tools/rehearsal/rehearse_command.h"
#include "tools/report/registry_commands.h"
#include "tools/report/report_commands.h"
#include "tools/stat/stat_commands.h"
#include "tools/whitelist/whitelist_commands.h"

namespace tavrel {
namespace {

void addGlobalOptions(CLI::App& app, ToolContext& context) {
  app.fallthrough();
  app.require_subcommand(1);
  app.footer("--root DIR may appear anywhere on the line. See tavrelctl(1).");
  app.set_version_flag("--version", "tavrelctl " + std::string(version()));
  app.add_option_function<std::string>(
         "--root",
         [&context](const std::string& folder) {
           if (folder.empty()) throw CLI::ValidationError("--root", "names no folder");
           context.setRoot(folder);
         },
         "Folder that holds the device's files (default: TAVREL_ROOT, else /)")
      ->type_name("DIR");
}

struct Subcommand {
  std::string_view name;
  void (*add)(Command top, ToolContext& context);
};

// In the order of the help. Making all of them takes longer than running a short command, so a line
// that names one of them gets only that one.
constexpr Subcommand kSubcommands[] = {
    {"status", addStatusCommand},
    {"allow", addAllowCommand},
    {"deny", addDenyCommand},
    {"erase", addEraseCommand},
    {"rehearse", addRehearseCommand},
    {"log", addLogCommands},
    {"whitelist", addWhitelistCommands},
    {"stat", addStatCommands},
    {"catalogue", addCatalogueCommand},
    {"send", addSendCommands},
    {"notify", addNotifyCommands},
    {"tasking", addTaskingCommands},
    {"disks", addDisksCommand},
    {"nand", addNandCommands},
    {"nandlog", addNandlogCommands},
    {"records", addRecordsCommands},
    {"prefs", addPrefsCommands},
    {"plist", addPlistCommands},
    {"registry", addRegistryCommands},
    {"report", addReportCommands},
    {"limits", addLimitsCommand},
    {"tidy", addTidyCommand},
    {"export", addExportCommands},
    {"page", addPageCommand},
};

// It describes all other commands, so it needs them as well.
constexpr std::string_view kCompletion = "completion";

// The first argument that is neither an option nor the value of --root; empty when there is none.
std::string_view firstWord(const std::vector<std::string>& arguments) {
  for (std::size_t i = 0; i < arguments.size(); ++i) {
    if (arguments[i] == "--root") {
      ++i;
    } else if (!arguments[i].starts_with('-')) {
      return arguments[i];
    }
  }
  return {};
}

void run(const std::vector<std::string>& arguments, ToolContext& context) {
  CLI::App app("Inspects tavrel and the statistics that it reports.", "tavrelctl");
  addGlobalOptions(app, context);
  const Command top(app);
  const std::string_view named = firstWord(arguments);
  const bool isNamed = std::ranges::any_of(
      kSubcommands, [&](const Subcommand& subcommand) { return subcommand.name == named; });
  for (const Subcommand& subcommand : kSubcommands) {
    if (!isNamed || subcommand.name == named) subcommand.add(top, context);
  }
  if (named == kCompletion) addCompletionCommand(top, context);

  runCommandLine(app, arguments, context);
}

}  // namespace

int runTavrelctl(const std::vector<std::string>& arguments, const ToolStreams& streams) {
  ToolContext context(streams);
  try {
    run(arguments, context);
  } catch (const std::exception& error) {
    context.fail(error.what());
  }
  context.finish();
  return context.exitStatus();
}

}  // namespace tavrel
