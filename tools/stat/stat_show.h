// One statistic over the days in the store.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "tools/shared/tool_context.h"

namespace tavrel {

/// Prints a scalar day by day, or a distribution's summary, percentiles, histogram and a line for
/// each day. Covers the last `days` days, including today, or all days.
void showStatistic(ToolContext& context, const std::string& key, std::optional<std::uint32_t> days);

}  // namespace tavrel
