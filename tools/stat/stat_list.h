// The content of the store as a table or as JSON, printed as it is read.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "tools/shared/tool_context.h"

namespace tavrel {

/// Lists the statistics whose keys begin with `prefix`, for one day or all days.
void listStatistics(ToolContext& context, const std::string& prefix,
                    std::optional<std::int32_t> day);

}  // namespace tavrel
