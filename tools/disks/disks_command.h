// tavrelctl disks
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addDisksCommand(Command app, ToolContext& context);

}  // namespace tavrel
