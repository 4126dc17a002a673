// tavrelctl plist
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addPlistCommands(Command app, ToolContext& context);

}  // namespace tavrel
