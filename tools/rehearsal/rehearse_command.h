// tavrelctl rehearse
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addRehearseCommand(Command app, ToolContext& context);

}  // namespace tavrel
