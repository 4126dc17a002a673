// tavrelctl completion: describes the commands for shells and the build. Hidden from the help.
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

/// The program must have all its commands by the time this one runs.
void addCompletionCommand(Command program, ToolContext& context);

}  // namespace tavrel
