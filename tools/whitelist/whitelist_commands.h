// tavrelctl whitelist
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addWhitelistCommands(CLI::App& app, ToolContext& context);

}  // namespace tavrel
