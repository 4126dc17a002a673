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

/// `text` on one line and harmless to a terminal: control characters and malformed bytes become
/// escapes (\n, \t, \x1b).
std::string printable(std::string_view text);

/// The columns of `text` on a terminal: one per code point.
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

  /// Each row begins with `indent` blanks.
  explicit Table(std::vector<Column> columns, std::size_t indent = 0);

  /// Missing cells are empty; surplus ones are dropped.
  void add(std::vector<std::string> cells);
  bool empty() const { return rows_.empty(); }

  /// With `columns`, the width of a terminal, the widest column of left-aligned text is cut ("…")
  /// as far as needed to fit; without it, cells are whole, and long ones shift the rest of their
  /// row. Titles are not printed when all are empty.
  void print(std::ostream& out, std::optional<std::size_t> columns) const;

 private:
  std::vector<Column> columns_;
  std::vector<std::vector<std::string>> rows_;
  std::size_t indent_;
};

}  // namespace tavrel
