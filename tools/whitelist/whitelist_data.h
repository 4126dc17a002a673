// What a whitelist would let out of the statistics that the device holds.
#pragma once

#include <vector>

#include "base/plist.h"
#include "tools/shared/tool_context.h"
#include "tools/whitelist/whitelist_check.h"

namespace tavrel {

/// Distributions of the last whole day in the store whose values the whitelist does not coarsen, or
/// that a value which is not a number spoils; none without a store. Each value is read. When the
/// store cannot be read, a line says so, the exit status becomes 2, and findings may be missing.
std::vector<WhitelistFinding> checkAgainstData(ToolContext& context, const plist::Value& whitelist);

}  // namespace tavrel
