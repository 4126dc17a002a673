// tavrelctl tasking: what the device is tasked with.
#pragma once

#include <CLI/App.hpp>

#include "tools/shared/tool_context.h"

namespace tavrel {

void addTaskingCommands(CLI::App& app, ToolContext& context);

}  // namespace tavrel
