// tavrelctl status
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addStatusCommand(Command app, ToolContext& context);

}  // namespace tavrel
