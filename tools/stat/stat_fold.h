// tavrelctl stat fold
#pragma once

#include "tools/shared/tool_context.h"

namespace tavrel {

/// Moves what programs recorded into the store, and prints what that was.
void foldStatistics(ToolContext& context);

}  // namespace tavrel
