// tavrelctl records
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addRecordsCommands(CLI::App& app, ToolContext& context);

}  // namespace tavrel
