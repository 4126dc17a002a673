// tavrelctl prefs
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addPrefsCommands(CLI::App& app, ToolContext& context);

}  // namespace tavrel
