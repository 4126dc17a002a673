// Tables, bars and texts from outside, for people.
#pragma once

#include <cstddef>
#include <cstdint>
#include <iosfwd>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "tools/shared/page.h"

namespace tavrel {

/// `text` on one line and harmless to a terminal: control characters and malformed bytes become
/// escapes (\n, \t, \x1b).
std::string printable(std::string_view text);

/// The columns of `text` on a terminal: one per code point.
std::size_t displayWidth(std::string_view text);

/// "1 value", "2 values".
std::string counted(std::uint64_t count, std::string_view what);

/// Rows of texts in aligned columns, two blanks between them.
class Table {
 public:
  /// Left-aligned or right-aligned text, text that is never cut, or bars.
  enum class Align : std::uint8_t { Left, Right, Whole, Bar };
  struct Column {
    std::string title;
    Align align = Align::Left;
    /// On a terminal too narrow for all columns, those with the highest rank are left out first;
    /// those with 0 stay.
    unsigned rank = 0;
  };
  struct Cell {
    Cell(const char* cellText) : text(cellText) {}
    Cell(std::string cellText, Emphasis cellEmphasis = Emphasis::None)
        : text(std::move(cellText)), emphasis(cellEmphasis) {}
    /// A bar that fills `value` out of `largest` of its column; at least one mark unless `value` is
    /// 0.
    static Cell bar(double value, double largest);

    std::string text;  // made printable by the table
    Emphasis emphasis = Emphasis::None;
    double share = 0;  // of a bar
  };

  /// Each row begins with `indent` blanks.
  explicit Table(std::vector<Column> columns, std::size_t indent = 0);

  /// Missing cells are empty; surplus ones are dropped.
  void add(std::vector<Cell> cells);
  bool empty() const { return rows_.empty(); }

  /// On a terminal columns with a rank are left out as far as needed to fit, which a line below
  /// says, and then the widest column of left-aligned text is cut ("…"); elsewhere all columns are
  /// there, cells are whole, and long ones push the rest of their row aside. Bars take the columns
  /// that are left. Titles that are all empty are not printed.
  void print(const Page& page);

 private:
  std::size_t textWidth(std::size_t column) const;
  void leaveOutColumns(std::size_t room);
  std::vector<std::size_t> widths(const Page& page) const;
  void printRow(const Page& page, const std::vector<Cell>& row,
                const std::vector<std::size_t>& widths) const;

  std::vector<Column> columns_;
  std::vector<std::vector<Cell>> rows_;
  std::size_t indent_;
  std::string leftOut_;  // titles of columns
};

}  // namespace tavrel
