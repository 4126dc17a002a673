// tavrelctl prefs
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addPrefsCommands(Command app, ToolContext& context);

}  // namespace tavrel
