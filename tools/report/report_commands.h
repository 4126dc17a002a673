// tavrelctl report: the channels that drivers publish, and their values.
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addReportCommands(CLI::App& app, ToolContext& context);

}  // namespace tavrel
