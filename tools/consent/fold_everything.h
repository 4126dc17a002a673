// Moves all that programs recorded into the store.
#pragma once

#include "base/expected.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

/// Moves what programs recorded into the store, in as many folds as that takes. Fails when a fold
/// leaves as much as the previous one: something else must happen first.
Status foldEverything(ToolContext& context);

}  // namespace tavrel
