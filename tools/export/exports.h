// The figures of a page of metrics, by where they come from.
#pragma once

#include <cstdint>
#include <optional>

#include "tools/export/metric_page.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

/// Statistics of one day; without it of the latest that the store has, up to today.
void exportStatistics(ToolContext& context, std::optional<std::int32_t> day, MetricPage& page);

/// The report channels that drivers publish, except for the health of drives.
void exportChannels(ToolContext& context, MetricPage& page);

/// The health of drives.
void exportDisks(ToolContext& context, MetricPage& page);

/// What `status --check` looks at.
void exportChecks(ToolContext& context, MetricPage& page);

}  // namespace tavrel
