// tavrelctl limits: compares what the device holds with its limits. tavrelctl tidy:
// removes whatever exceeds them.
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addLimitsCommand(Command app, ToolContext& context);
void addTidyCommand(Command app, ToolContext& context);

}  // namespace tavrel
