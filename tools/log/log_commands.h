// tavrelctl log
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addLogCommands(Command app, ToolContext& context);

}  // namespace tavrel
