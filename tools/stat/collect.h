// Samples this machine into statistics.
#pragma once

#include <cstdint>
#include <string_view>

#include "tools/shared/tool_context.h"

namespace tavrel {

/// Reads the machine now and once a second for `seconds`, for the statistics of the day of each
/// reading. Writes the readings once a minute and at the end; SIGINT and SIGTERM end it early.
void collectStatistics(ToolContext& context, std::uint32_t seconds);

/// The keys that are recorded, with their units, for people.
std::string_view collectedKeysHelp();

}  // namespace tavrel
