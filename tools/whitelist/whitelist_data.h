// What a whitelist would let out of the statistics recorded on the device.
#pragma once

#include <vector>

#include "base/plist.h"
#include "tools/shared/tool_context.h"
#include "tools/whitelist/whitelist_check.h"

namespace tavrel {

/// Distributions of the last whole day in the store whose values the whitelist does not coarsen, or
/// that a not-a-number value spoils; none without a store. Reads every value. When the store cannot
/// be read, prints a line and sets the exit status to 2; findings may then be missing.
std::vector<WhitelistFinding> checkAgainstData(ToolContext& context, const plist::Value& whitelist);

}  // namespace tavrel
