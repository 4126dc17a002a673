// tavrelctl tasking: the scheduled tasking and the applied one.
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addTaskingCommands(Command app, ToolContext& context);

}  // namespace tavrel
