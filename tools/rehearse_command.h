// tavrelctl rehearse
#pragma once

#include "tools/tool_context.h"

namespace tavrel {

void addRehearseCommand(CLI::App& app, ToolContext& context);

}  // namespace tavrel
