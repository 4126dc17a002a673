// What the device has recorded: the store, and what is waiting to be folded into it.
#pragma once

#include <cstdint>
#include <limits>

#include "platform/linux/folding/recorded_history.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

inline constexpr std::int32_t kFirstDay = std::numeric_limits<std::int32_t>::min();
inline constexpr std::int32_t kLastDay = std::numeric_limits<std::int32_t>::max();

/// Opens the recorded statistics for reading. When a part is missing, prints a message and sets the
/// exit status to 1; the rest is readable.
Expected<RecordedHistory> openRecorded(ToolContext& context, RowSelection selection);

}  // namespace tavrel
