// What each subcommand of tavrel-fleet gets: the database, and tools/console/tool_output.h.
//
//   void addShowCommand(Command top, FleetContext& context) {
//     const Command show = top.addCommand("show", "Show one statistic");
//     ...
//     show.onRun([&context, options] {
//       const auto engine = context.openDatabase(OpenMode::Read);
//       ...
//     });
//   }
#pragma once

#include <memory>
#include <string>

#include "fleet/engine/open/open_engine.h"
#include "tools/console/tool_output.h"

namespace tavrel::fleet {

class FleetContext : public ToolOutput {
 public:
  explicit FleetContext(const ToolStreams& streams) : ToolOutput("tavrel-fleet", streams) {}

  /// Where the tables are: the value of `--database`.
  std::string& database() { return database_; }
  /// Throws EngineError, which `runFleet` turns into a failure.
  std::unique_ptr<Engine> openDatabase(OpenMode mode) { return openEngine(database_, mode); }

 private:
  std::string database_ = "fleet.db";
};

}  // namespace tavrel::fleet
