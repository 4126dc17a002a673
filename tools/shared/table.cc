#include "tools/shared/table.h"

#include <algorithm>
#include <ostream>

#include "base/format.h"
#include "base/utf8.h"

namespace tavrel {
namespace {

constexpr std::string_view kGap = "  ";
constexpr std::size_t kNarrowestColumn = 8;

// One long key would else push every row of a listing in a pipe far to the right.
constexpr std::size_t kWidestPadding = 48;

// Control characters, and the marks that turn the direction of the text around them.
bool actsOnTerminal(char32_t codePoint) {
  return codePoint < 0x20 || (codePoint >= 0x7F && codePoint < 0xA0) ||
         (codePoint >= 0x200E && codePoint <= 0x200F) ||
         (codePoint >= 0x2028 && codePoint <= 0x202E) ||
         (codePoint >= 0x2066 && codePoint <= 0x2069);
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

// The beginning of `text` that takes `width` columns.
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
  const auto isPlain = [](char character) { return character >= 0x20 && character < 0x7F; };
  if (std::ranges::all_of(text, isPlain)) return std::string(text);
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

std::string bar(std::uint64_t value, std::uint64_t largest, std::size_t width) {
  if (value == 0 || largest == 0) return {};
  const double share = static_cast<double>(value) / static_cast<double>(largest);
  const auto marks = static_cast<std::size_t>(share * static_cast<double>(width));
  return std::string(std::clamp<std::size_t>(marks, 1, std::max<std::size_t>(width, 1)), '#');
}

std::string counted(std::uint64_t count, std::string_view what) {
  return format("%llu %s%s", count, what, count == 1 ? "" : "s");
}

Table::Table(std::vector<Column> columns, std::size_t indent)
    : columns_(std::move(columns)), indent_(indent) {}

void Table::add(std::vector<std::string> cells) {
  cells.resize(columns_.size());
  for (std::string& cell : cells)
    cell = printable(cell);
  rows_.push_back(std::move(cells));
}

void Table::print(std::ostream& out, std::optional<std::size_t> columns) const {
  if (columns_.empty()) return;
  std::vector<std::size_t> widths;
  bool hasTitles = false;
  for (std::size_t i = 0; i < columns_.size(); ++i) {
    std::size_t width = displayWidth(columns_[i].title);
    hasTitles = hasTitles || width > 0;
    for (const auto& row : rows_)
      width = std::max(width, displayWidth(row[i]));
    widths.push_back(columns ? width : std::min(width, kWidestPadding));
  }

  if (columns) {
    std::size_t total = indent_ + kGap.size() * (columns_.size() - 1);
    std::size_t widest = 0;
    for (std::size_t i = 0; i < columns_.size(); ++i) {
      total += widths[i];
      const bool canGive = columns_[i].align == Align::Left;
      const bool widestGives = columns_[widest].align == Align::Left;
      if (canGive && (!widestGives || widths[i] > widths[widest])) widest = i;
    }
    if (total > *columns && columns_[widest].align == Align::Left) {
      const std::size_t surplus = total - *columns;
      const std::size_t narrowest = std::min(kNarrowestColumn, widths[widest]);
      widths[widest] = widths[widest] > surplus + narrowest ? widths[widest] - surplus : narrowest;
    }
  }

  std::string line;
  const auto printRow = [&](const auto& cellOf) {
    line.assign(indent_, ' ');
    for (std::size_t i = 0; i < columns_.size(); ++i) {
      const std::string& cell = cellOf(i);
      std::size_t width = displayWidth(cell);
      const bool isCut = columns && width > widths[i];
      if (isCut) width = widths[i];
      const std::size_t padding = widths[i] > width ? widths[i] - width : 0;
      if (i > 0) line += kGap;
      if (columns_[i].align == Align::Right) line.append(padding, ' ');
      line += isCut ? firstColumns(cell, widths[i] - 1) : std::string_view(cell);
      if (isCut) line += "…";
      if (columns_[i].align == Align::Left) line.append(padding, ' ');
    }
    line.erase(line.find_last_not_of(' ') + 1);
    line += '\n';
    out << line;
  };
  if (hasTitles) printRow([&](std::size_t i) -> const std::string& { return columns_[i].title; });
  for (const auto& row : rows_) {
    printRow([&](std::size_t i) -> const std::string& { return row[i]; });
  }
}

}  // namespace tavrel
