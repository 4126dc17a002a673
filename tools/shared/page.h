// Where text for people goes, what is known of the terminal there, and how text stands out on it.
#pragma once

#include <cstddef>
#include <cstdint>
#include <iosfwd>
#include <optional>
#include <string>
#include <string_view>

namespace tavrel {

/// Titles are strong; what somebody should look into is an alarm.
enum class Emphasis : std::uint8_t { None, Strong, Alarm };

struct Page {
  std::ostream& out;
  /// Of the terminal; nothing in a pipe, where lines are never cut.
  std::optional<std::size_t> columns = std::nullopt;
  /// Whether the terminal shows colours, and the user wants them.
  bool isColoured = false;

  /// What bars have room in: the same in every pipe.
  std::size_t barColumns() const { return columns.value_or(80); }

  /// `text`, which is printable, between the terminal's own marks. Without colours as it is.
  std::string styled(std::string_view text, Emphasis emphasis) const;
};

}  // namespace tavrel
