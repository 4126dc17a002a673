// Samples of this machine, as statistics.
#pragma once

#include <cstdint>
#include <string_view>

#include "tools/shared/tool_context.h"

namespace tavrel {

/// Reads the machine now and once a second for `seconds`, and keeps what it read in the statistics
/// of the day of each reading. Readings are kept once a minute and at the end,
/// which SIGINT and SIGTERM bring about early.
void collectStatistics(ToolContext& context, std::uint32_t seconds);

/// The keys that are recorded, with their units, for people.
std::string_view collectedKeysHelp();

}  // namespace tavrel
