#include "fleet/logs/interval_label.h"

#include <cmath>

#include "platform/plist/scalar_text.h"

namespace tavrel::fleet {

std::optional<Interval> parseIntervalLabel(std::string_view label) {
  if (label.size() < 2 || label.front() != '(') return std::nullopt;
  const char close = label.back();
  const std::string_view ends = label.substr(1, label.size() - 2);
  const std::size_t comma = ends.find(", ");
  if (comma == std::string_view::npos) return std::nullopt;
  const auto lower = plist::parseReal(ends.substr(0, comma));
  const auto upper = plist::parseReal(ends.substr(comma + 2));
  if (!lower || !upper || !(*lower < *upper)) return std::nullopt;
  // Only the last bucket is open above. It ends in "inf]" when the whitelist has that boundary.
  if (close != ']' && (close != ')' || !std::isinf(*upper))) return std::nullopt;
  return Interval{*lower, *upper};
}

}  // namespace tavrel::fleet
