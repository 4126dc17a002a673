#include "platform/linux/files/process_stat.h"

#include <algorithm>
#include <charconv>
#include <system_error>

namespace tavrel {

std::optional<std::uint64_t> startInStat(std::string_view stat) {
  stat.remove_prefix(std::min(stat.rfind(')'), stat.size()));
  for (int field = 2; field < 22; ++field) {
    const std::size_t space = stat.find(' ');
    if (space == std::string_view::npos) return std::nullopt;
    stat.remove_prefix(space + 1);
  }
  std::uint64_t start = 0;
  const auto [end, error] = std::from_chars(stat.data(), stat.data() + stat.size(), start);
  if (error != std::errc()) return std::nullopt;
  return start;
}

}  // namespace tavrel
