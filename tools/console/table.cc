#include "tools/console/table.h"

#include <algorithm>
#include <numeric>
#include <optional>
#include <ostream>
#include <utility>

#include "base/format.h"
#include "base/utf8.h"

namespace tavrel {
namespace {

constexpr std::string_view kGap = "  ";
constexpr std::size_t kNarrowestColumn = 8;

// Without this limit, one long key would push all rows of a listing in a pipe far to the right.
constexpr std::size_t kWidestPadding = 48;

// Control characters, line and paragraph separators, and characters that change the text direction.
bool actsOnTerminal(char32_t codePoint) {
  return codePoint < 0x20 || (codePoint >= 0x7F && codePoint < 0xA0) || codePoint == 0x2028 ||
         codePoint == 0x2029 || changesDirection(codePoint);
}

void appendEscape(std::string& out, std::string_view bytes) {
  if (bytes == "\n") {
    out += "\\n";
  } else if (bytes == "\t") {
    out += "\\t";
  } else {
    for (const char byte : bytes)
      appendFormat(out, "\\x%02x", static_cast<unsigned char>(byte));
  }
}

// The beginning of `text` that fits in `width` columns.
std::string_view firstColumns(std::string_view text, std::size_t width) {
  std::string_view rest = text;
  while (width > 0 && !rest.empty()) {
    takeCodePoint(rest);
    --width;
  }
  return text.substr(0, text.size() - rest.size());
}

}  // namespace

std::string printable(std::string_view text) {
  if (std::ranges::all_of(text, isPrintableAscii)) return std::string(text);
  std::string out;
  out.reserve(text.size());
  while (!text.empty()) {
    const std::string_view before = text;
    const char32_t codePoint = takeCodePoint(text);
    const std::string_view bytes = before.substr(0, before.size() - text.size());
    const bool malformed = codePoint == kReplacementCharacter && bytes.size() == 1;
    if (malformed || actsOnTerminal(codePoint)) {
      appendEscape(out, bytes);
    } else {
      out += bytes;
    }
  }
  return out;
}

std::size_t displayWidth(std::string_view text) {
  return static_cast<std::size_t>(std::count_if(text.begin(), text.end(), [](char byte) {
    return (static_cast<unsigned char>(byte) & 0xC0U) != 0x80U;
  }));
}

std::string counted(std::uint64_t count, std::string_view what) {
  return format("%llu %s%s", count, what, count == 1 ? "" : "s");
}

Table::Cell Table::Cell::bar(double value, double largest) {
  Cell cell("");
  if (value > 0 && largest > 0) cell.share = std::min(value / largest, 1.0);
  return cell;
}

Table::Table(std::vector<Column> columns, std::size_t indent)
    : columns_(std::move(columns)), indent_(indent) {}

void Table::add(std::vector<Cell> cells) {
  cells.resize(columns_.size(), "");
  for (Cell& cell : cells)
    cell.text = printable(cell.text);
  rows_.push_back(std::move(cells));
}

std::size_t Table::textWidth(std::size_t column) const {
  std::size_t width = displayWidth(columns_[column].title);
  for (const auto& row : rows_)
    width = std::max(width, displayWidth(row[column].text));
  return width;
}

void Table::leaveOutColumns(std::size_t room) {
  std::size_t taken = indent_;
  for (std::size_t i = 0; i < columns_.size(); ++i)
    taken += (i == 0 ? 0 : kGap.size()) + textWidth(i);
  while (taken > room) {
    const auto least = std::ranges::max_element(columns_, {}, &Column::rank);
    if (least->rank == 0) return;
    const auto index = least - columns_.begin();
    taken -= kGap.size() + textWidth(static_cast<std::size_t>(index));
    leftOut_ += (leftOut_.empty() ? "" : ", ") + least->title;
    columns_.erase(least);
    for (auto& row : rows_)
      row.erase(row.begin() + index);
  }
}

std::vector<std::size_t> Table::widths(const Page& page) const {
  std::vector<std::size_t> widths;
  for (std::size_t i = 0; i < columns_.size(); ++i) {
    const std::size_t width = textWidth(i);
    widths.push_back(page.columns ? width : std::min(width, kWidestPadding));
  }
  const std::size_t taken =
      std::accumulate(widths.begin(), widths.end(), indent_ + kGap.size() * (columns_.size() - 1));

  std::optional<std::size_t> widest;  // of the columns that can be cut
  for (std::size_t i = 0; i < columns_.size(); ++i) {
    if (columns_[i].align == Align::Bar) {
      const std::size_t room = page.barColumns() > taken ? page.barColumns() - taken : 0;
      widths[i] = std::max(room, kNarrowestColumn);
    } else if (columns_[i].align == Align::Left && (!widest || widths[i] > widths[*widest])) {
      widest = i;
    }
  }
  if (page.columns && taken > *page.columns && widest) {
    std::size_t& width = widths[*widest];
    const std::size_t surplus = taken - *page.columns;
    // Otherwise the terminal wraps the line in any case, so that nothing need be lost.
    if (width >= surplus + kNarrowestColumn) width -= surplus;
  }
  return widths;
}

void Table::printRow(const Page& page, const std::vector<Cell>& row,
                     const std::vector<std::size_t>& widths) const {
  std::string line(indent_, ' ');
  std::size_t blanks = 0;  // pending blanks before the next text
  for (std::size_t i = 0; i < columns_.size(); ++i) {
    if (i > 0) blanks += kGap.size();
    std::string shown = row[i].text;
    if (row[i].share > 0) {
      const auto marks = static_cast<std::size_t>(row[i].share * static_cast<double>(widths[i]));
      shown = std::string(std::max<std::size_t>(marks, 1), '#');
    } else if (page.columns && displayWidth(shown) > widths[i]) {
      shown = std::string(firstColumns(shown, widths[i] - 1)) + "…";
    }
    const std::size_t width = displayWidth(shown);
    const std::size_t padding = widths[i] > width ? widths[i] - width : 0;
    if (columns_[i].align == Align::Right) blanks += padding;
    if (!shown.empty()) {
      line.append(std::exchange(blanks, 0), ' ');
      line += page.styled(shown, row[i].emphasis);
    }
    if (columns_[i].align != Align::Right) blanks += padding;
  }
  if (line.size() == indent_) line.clear();
  page.out << line << '\n';
}

void Table::print(const Page& page) {
  if (columns_.empty()) return;
  if (page.columns) leaveOutColumns(*page.columns);
  const std::vector<std::size_t> all = widths(page);
  std::vector<Cell> titles;
  bool hasTitles = false;
  for (const Column& column : columns_) {
    titles.emplace_back(column.title, Emphasis::Strong);
    hasTitles = hasTitles || !column.title.empty();
  }
  if (hasTitles) printRow(page, titles, all);
  for (const auto& row : rows_)
    printRow(page, row, all);
  if (!leftOut_.empty())
    page.out << std::string(indent_, ' ') << "No room for " << leftOut_ << ": widen the terminal\n";
}

}  // namespace tavrel
