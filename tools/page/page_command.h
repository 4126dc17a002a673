// tavrelctl page: the device on one page.
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addPageCommand(Command app, ToolContext& context);

}  // namespace tavrel
