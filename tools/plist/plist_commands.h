// tavrelctl plist
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addPlistCommands(CLI::App& app, ToolContext& context);

}  // namespace tavrel
