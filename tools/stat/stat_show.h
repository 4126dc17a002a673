// One statistic over the days that are held.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "tools/shared/tool_context.h"

namespace tavrel {

/// Prints a scalar day by day, and of a distribution a summary, percentiles, a histogram and a line
/// for each day: of the last `days` days, today included, or of all.
void showStatistic(ToolContext& context, const std::string& key, std::optional<std::uint32_t> days);

}  // namespace tavrel
