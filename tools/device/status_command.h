// tavrelctl status
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addStatusCommand(CLI::App& app, ToolContext& context);

}  // namespace tavrel
