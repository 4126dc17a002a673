#include "fleet/fleet_tool.h"

#include <CLI/CLI.hpp>
#include <exception>
#include <string>
#include <system_error>

#include "base/format.h"
#include "base/version.h"
#include "fleet/commands/compare_command.h"
#include "fleet/commands/completion_command.h"
#include "fleet/commands/load_command.h"
#include "fleet/commands/page_command.h"
#include "fleet/commands/show_command.h"
#include "fleet/commands/summary_command.h"
#include "tools/console/command_line.h"

namespace tavrel::fleet {
namespace {

// In the order of the help.
constexpr void (*kSubcommands[])(Command top, FleetContext& context) = {
    addLoadCommand,    addSummaryCommand, addShowCommand,
    addCompareCommand, addPageCommand,    addCompletionCommand};

void addGlobalOptions(CLI::App& app, const Command& top, FleetContext& context) {
  app.fallthrough();
  app.require_subcommand(1);
  app.footer("--database may appear anywhere on the line. See tavrel-fleet(1).");
  app.set_version_flag("--version", "tavrel-fleet " + std::string(version()));
  top.addOption(
         "--database", context.database(),
         "File of the tables, or clickhouse[s]://[USER@]HOST[:PORT]/NAME[?OPTION=VALUE[&...]]")
      .typeName("WHERE")
      .showDefault()
      .check(databaseFault);
}

// A thread that cannot be started says no more than that.
std::string reasonOf(const std::exception& error) {
  const auto* const system = dynamic_cast<const std::system_error*>(&error);
  if (system == nullptr || system->code() != std::errc::resource_unavailable_try_again)
    return error.what();
  return format("cannot start a thread: %s: allow more processes (ulimit -u, TasksMax)",
                system->code().message());
}

}  // namespace

int runFleet(const std::vector<std::string>& arguments, const ToolStreams& streams) {
  FleetContext context(streams);
  try {
    CLI::App app("Files the logs of many devices in tables and answers questions about them.",
                 "tavrel-fleet");
    const Command top(app);
    addGlobalOptions(app, top, context);
    for (const auto add : kSubcommands)
      add(top, context);
    runCommandLine(app, arguments, context);
  } catch (const std::exception& error) {
    context.fail(reasonOf(error));
  }
  context.finish();
  return context.exitStatus();
}

}  // namespace tavrel::fleet
