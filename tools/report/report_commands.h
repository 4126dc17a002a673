// tavrelctl report: the channels that drivers publish, and their values.
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

void addReportCommands(Command app, ToolContext& context);

}  // namespace tavrel
