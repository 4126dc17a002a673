// tavrelctl records
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addRecordsCommands(Command app, ToolContext& context);

}  // namespace tavrel
