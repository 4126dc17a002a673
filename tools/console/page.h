// The output for human readers: its stream, what is known about the terminal, and emphasis.
#pragma once

#include <cstddef>
#include <cstdint>
#include <iosfwd>
#include <optional>
#include <string>
#include <string_view>

namespace tavrel {

/// Titles are strong; figures that need attention are alarms.
enum class Emphasis : std::uint8_t { None, Strong, Alarm };

struct Page {
  std::ostream& out;
  /// Of the terminal; nothing in a pipe, whose lines are never cut.
  std::optional<std::size_t> columns = std::nullopt;
  /// Whether the terminal shows colours and the user wants them.
  bool isColoured = false;

  /// How wide lines with bars may be; in a pipe always the same.
  std::size_t barColumns() const { return columns.value_or(80); }

  /// `text`, which must be printable, enclosed in the terminal's control sequences; unchanged
  /// when there are no colours.
  std::string styled(std::string_view text, Emphasis emphasis) const;
};

}  // namespace tavrel
