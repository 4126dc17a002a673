// /proc/PID/stat.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

namespace tavrel {

/// When the process started, in clock ticks since boot: field 22. The second field, the program's
/// name in parentheses, may contain anything. Nothing for text of another form.
std::optional<std::uint64_t> startInStat(std::string_view stat);

}  // namespace tavrel
