// tavrelctl erase
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addEraseCommand(Command app, ToolContext& context);

}  // namespace tavrel
