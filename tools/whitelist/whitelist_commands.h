// tavrelctl whitelist
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addWhitelistCommands(Command app, ToolContext& context);

}  // namespace tavrel
