// tavrelctl nandlog
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addNandlogCommands(CLI::App& app, ToolContext& context);

}  // namespace tavrel
