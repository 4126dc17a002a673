// Tables, bars and texts from outside, for people.
#pragma once

#include <cstddef>
#include <cstdint>
#include <iosfwd>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace tavrel {

/// `text` on one line and harmless to a terminal: control characters and malformed bytes are
/// written as escapes (\n, \t, \x1b).
std::string printable(std::string_view text);

/// Columns that `text` takes on a terminal: one for each code point.
std::size_t displayWidth(std::string_view text);

/// A bar of `value` out of `largest` in at most `width` columns; at least one mark unless 0.
std::string bar(std::uint64_t value, std::uint64_t largest, std::size_t width);

/// "1 value", "2 values".
std::string counted(std::uint64_t count, std::string_view what);

/// Rows of texts in aligned columns, two blanks between them. Cells are made printable.
class Table {
 public:
  enum class Align : std::uint8_t { Left, Right };
  struct Column {
    std::string title;
    Align align = Align::Left;
  };

  /// `indent` blanks stand before each row.
  explicit Table(std::vector<Column> columns, std::size_t indent = 0);

  /// Missing cells are empty; surplus ones are dropped.
  void add(std::vector<std::string> cells);
  bool empty() const { return rows_.empty(); }

  /// With `columns`, the width of a terminal, the widest column of left-aligned text is cut ("…")
  /// as far as needed to fit; without, cells are whole, and long ones push the rest of their row
  /// aside. Titles that are all empty are not printed.
  void print(std::ostream& out, std::optional<std::size_t> columns) const;

 private:
  std::vector<Column> columns_;
  std::vector<std::vector<std::string>> rows_;
  std::size_t indent_;
};

}  // namespace tavrel
