// tavrelctl limits: what the device holds, beside its limits. tavrelctl tidy: removes what exceeds
// them.
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addLimitsCommand(Command app, ToolContext& context);
void addTidyCommand(Command app, ToolContext& context);

}  // namespace tavrel
