// tavrelctl status
#pragma once

#include "tools/tool_context.h"

namespace tavrel {

void addStatusCommand(CLI::App& app, ToolContext& context);

}  // namespace tavrel
