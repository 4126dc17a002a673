// Fetches the storage controller's statistics and parses them.
#pragma once

#include "platform/driver_registry.h"
#include "platform/standard_streams.h"
#include "storage/nand_exporters.h"
#include "storage/parse/asp_context.h"

namespace tavrel {

/// Adds the statistics of the first driver that is present to an empty context. `exporter` receives
/// its row in any case. The row's `release`, if any, empties the context; so does its destruction.
/// On failure a line on standard error says why, unless the driver offers no statistics or they
/// cannot be parsed.
bool fetchStatistics(DriverRegistry& drivers, StandardStreams& streams,
                     const NandExporter*& exporter, ASPContext& context);

}  // namespace tavrel
