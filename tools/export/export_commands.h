// tavrelctl export: prints figures in the formats of other programs.
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addExportCommands(Command app, ToolContext& context);

}  // namespace tavrel
