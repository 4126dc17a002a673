// tavrelctl nandlog
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addNandlogCommands(Command app, ToolContext& context);

}  // namespace tavrel
