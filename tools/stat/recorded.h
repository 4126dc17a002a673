// What the device has recorded: the store, and what waits to be folded into it.
#pragma once

#include <cstdint>
#include <limits>

#include "platform/linux/folding/recorded_history.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

inline constexpr std::int32_t kFirstDay = std::numeric_limits<std::int32_t>::min();
inline constexpr std::int32_t kLastDay = std::numeric_limits<std::int32_t>::max();

/// Opens it for reading. When something is missing, says so and makes the exit status 1; the rest
/// can be read.
Expected<RecordedHistory> openRecorded(ToolContext& context, RowSelection selection);

}  // namespace tavrel
