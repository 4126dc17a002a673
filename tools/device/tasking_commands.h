// tavrelctl tasking: the scheduled and the applied tasking.
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addTaskingCommands(Command app, ToolContext& context);

}  // namespace tavrel
