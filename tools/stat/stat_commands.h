// tavrelctl stat: the statistics that are kept, and keeping some.
#pragma once

#include <CLI/App.hpp>

#include "tools/shared/tool_context.h"

namespace tavrel {

void addStatCommands(CLI::App& app, ToolContext& context);

}  // namespace tavrel
