// /proc/PID/stat.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

namespace tavrel {

/// When the process began, in ticks since boot: field 22. The second field is the program's name in
/// parentheses, which may hold anything. Nothing for other text.
std::optional<std::uint64_t> startInStat(std::string_view stat);

}  // namespace tavrel
