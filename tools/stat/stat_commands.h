// tavrelctl stat: the statistics that are kept, and keeping some.
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addStatCommands(Command app, ToolContext& context);

}  // namespace tavrel
