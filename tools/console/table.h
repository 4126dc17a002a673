// Tables, bars and untrusted text for human readers.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "tools/console/page.h"

namespace tavrel {

/// `text` on one line and harmless to a terminal: control characters and malformed bytes
/// become escapes (\n, \t, \x1b).
std::string printable(std::string_view text);

/// How many columns `text` takes on a terminal: one per code point.
std::size_t displayWidth(std::string_view text);

/// "1 value", "2 values".
std::string counted(std::uint64_t count, std::string_view what);

/// Rows of text in aligned columns, separated by two blanks.
class Table {
 public:
  /// Left-aligned or right-aligned text, text that is never cut, or bars.
  enum class Align : std::uint8_t { Left, Right, Whole, Bar };
  struct Column {
    std::string title;
    Align align = Align::Left;
    /// On a terminal too narrow for all columns, the ones with the highest rank are left out
    /// first; those with rank 0 stay.
    unsigned rank = 0;
  };
  struct Cell {
    Cell(const char* cellText) : text(cellText) {}
    Cell(std::string cellText, Emphasis cellEmphasis = Emphasis::None)
        : text(std::move(cellText)), emphasis(cellEmphasis) {}
    /// A bar as long as `value` relative to `largest` in its column; at least one
    /// mark unless `value` is 0.
    static Cell bar(double value, double largest);

    std::string text;  // the table makes it printable
    Emphasis emphasis = Emphasis::None;
    double share = 0;  // of a bar
  };

  /// Each row begins with `indent` blanks.
  explicit Table(std::vector<Column> columns, std::size_t indent = 0);

  /// Missing cells are empty; surplus ones are dropped.
  void add(std::vector<Cell> cells);
  bool empty() const { return rows_.empty(); }

  /// On a terminal, leaves out ranked columns until the table fits, says so in a line below it, and
  /// then cuts the widest column of left-aligned text ("…") if the table then fits. Elsewhere all
  /// columns appear, cells are whole, and long ones push the rest of their row to the right. Bars
  /// take the remaining width. Titles are not printed when all are empty.
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
