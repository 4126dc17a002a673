// tavrelctl rehearse
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addRehearseCommand(CLI::App& app, ToolContext& context);

}  // namespace tavrel
