// The content of the store as a table or as JSON, printed while it is read.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "tools/shared/tool_context.h"

namespace tavrel {

/// Lists the statistics whose keys begin with `prefix`, of one day or of all.
void listStatistics(ToolContext& context, const std::string& prefix,
                    std::optional<std::int32_t> day);

}  // namespace tavrel
