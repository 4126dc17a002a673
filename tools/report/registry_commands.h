// tavrelctl registry: the services of the recorded drivers.
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addRegistryCommands(Command app, ToolContext& context);

}  // namespace tavrel
