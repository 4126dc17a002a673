// tavrelctl stat: shows and records statistics.
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addStatCommands(Command app, ToolContext& context);

}  // namespace tavrel
