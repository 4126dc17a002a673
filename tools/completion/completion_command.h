// tavrelctl completion: what shells and the build want to know of the commands. Not in the help.
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

/// The program must have all its commands when this one runs.
void addCompletionCommand(Command program, ToolContext& context);

}  // namespace tavrel
