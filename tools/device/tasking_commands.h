// tavrelctl tasking: what the device is tasked with.
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addTaskingCommands(Command app, ToolContext& context);

}  // namespace tavrel
