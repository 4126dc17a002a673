// The output for text that people read: its stream, what is known of the terminal, and emphasis.
#pragma once

#include <cstddef>
#include <cstdint>
#include <iosfwd>
#include <optional>
#include <string>
#include <string_view>

namespace tavrel {

/// Titles are strong; figures that somebody should look into are alarms.
enum class Emphasis : std::uint8_t { None, Strong, Alarm };

struct Page {
  std::ostream& out;
  /// Of the terminal; nothing in a pipe, where lines are never cut.
  std::optional<std::size_t> columns = std::nullopt;
  /// Whether the terminal shows colours, and the user wants them.
  bool isColoured = false;

  /// The columns for lines with bars: the same in every pipe.
  std::size_t barColumns() const { return columns.value_or(80); }

  /// `text`, which must be printable, between the terminal's control sequences; unchanged without
  /// colours.
  std::string styled(std::string_view text, Emphasis emphasis) const;
};

}  // namespace tavrel
