// The figures on a page of metrics, grouped by source.
#pragma once

#include <cstdint>
#include <optional>

#include "tools/export/metric_page.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

/// Statistics of one day; without `day`, of the latest in the store, up to today.
void exportStatistics(ToolContext& context, std::optional<std::int32_t> day, MetricPage& page);

/// The report channels that drivers publish, except for the health of drives.
void exportChannels(ToolContext& context, MetricPage& page);

/// The health of drives.
void exportDisks(ToolContext& context, MetricPage& page);

/// The checks of `status --check`.
void exportChecks(ToolContext& context, MetricPage& page);

}  // namespace tavrel
