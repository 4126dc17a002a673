// tavrelctl allow, deny
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addAllowCommand(Command app, ToolContext& context);
void addDenyCommand(Command app, ToolContext& context);

}  // namespace tavrel
