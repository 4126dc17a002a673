#include "platform/linux/health/log_page.h"

#include <algorithm>
#include <limits>
#include <optional>

#include "base/arithmetic.h"

namespace tavrel::health {
namespace {

constexpr std::uint64_t kLargest = std::numeric_limits<std::int64_t>::max();

std::optional<std::int64_t> valueAt(ByteSpan page, const Place& place) {
  const auto field = slice(page, place.offset, place.width);
  if (!field || field->empty()) return std::nullopt;
  const bool isAllOnes =
      std::ranges::all_of(*field, [](std::byte byte) { return byte == std::byte{0xFF}; });
  if (isAllOnes && place.width > 1) return std::nullopt;
  std::uint64_t value = 0;
  for (std::size_t i = field->size(); i-- > 0;) {
    const auto byte = std::to_integer<std::uint64_t>((*field)[i]);
    if (i < sizeof value) {
      value |= byte << (8 * i);
    } else if (byte != 0) {
      return static_cast<std::int64_t>(kLargest);
    }
  }
  if ((value == 0 && place.zeroIsUnknown) || (place.width == 1 && value > place.largest)) {
    return std::nullopt;
  }
  const std::uint64_t scaled = checkedMultiply(value, place.multiplier).value_or(kLargest);
  return static_cast<std::int64_t>(std::min(scaled, kLargest));
}

}  // namespace

void appendFields(ByteSpan page, std::span<const FigureKind> kinds, Figures& figures) {
  for (const FigureKind& kind : kinds) {
    if (const auto value = valueAt(page, kind.place)) figures.push_back({&kind, *value});
  }
}

bool isBlank(ByteSpan page) {
  return std::ranges::all_of(page, [&](std::byte byte) { return byte == page.front(); });
}

}  // namespace tavrel::health
