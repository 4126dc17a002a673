// `tavrelctl catalogue`: explains what figures mean.
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addCatalogueCommand(Command app, ToolContext& context);

}  // namespace tavrel
