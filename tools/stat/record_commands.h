// `tavrelctl stat add`, `stat set` and `stat record`.
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addRecordCommands(Command group, ToolContext& context);

}  // namespace tavrel
