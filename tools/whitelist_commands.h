// tavrelctl whitelist
#pragma once

#include "tools/tool_context.h"

namespace tavrel {

void addWhitelistCommands(CLI::App& app, ToolContext& context);

}  // namespace tavrel
