#include "fleet/commands/load_command.h"

#include <memory>
#include <vector>

namespace tavrel::fleet {
namespace {

struct LoadOptions {
  std::vector<std::string> paths;
};

}  // namespace

void addLoadCommand(Command top, FleetContext& context) {
  const Command load = top.addCommand("load", "File logs in the tables");
  auto options = std::make_shared<LoadOptions>();
  load.addOption("PATH", options->paths, "Files, folders or archives").typeName("FILE").required();
  load.onRun([&context, options] {
    context.openDatabase(OpenMode::kWrite);
    context.fail("cannot read logs: this program does not know how yet");
  });
}

}  // namespace tavrel::fleet
