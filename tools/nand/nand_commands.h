// `tavrelctl nand`: the NAND information, and the storage controller's raw buffers.
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addNandCommands(Command app, ToolContext& context);

}  // namespace tavrel
