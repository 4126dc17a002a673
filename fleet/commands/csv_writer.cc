#include "fleet/commands/csv_writer.h"

#include <array>
#include <charconv>
#include <cmath>
#include <ostream>

#include "base/utf8.h"

namespace tavrel::fleet {
namespace {

bool isControl(char32_t codePoint) {
  return (codePoint < 0x20 && codePoint != '\t' && codePoint != '\r' && codePoint != '\n') ||
         (codePoint >= 0x7F && codePoint < 0xA0);
}

}  // namespace

void CsvWriter::separate() {
  if (!isFirst_) out_ << ',';
  isFirst_ = false;
}

CsvWriter& CsvWriter::title(std::string_view value) {
  separate();
  if (value.find_first_of("\",\r\n") == std::string_view::npos) {
    out_ << value;
    return *this;
  }
  out_ << '"';
  for (const char c : value) {
    if (c == '"') out_ << '"';
    out_ << c;
  }
  out_ << '"';
  return *this;
}

CsvWriter& CsvWriter::text(std::string_view value) {
  constexpr std::string_view kFormulas = "=+-@\t\r";
  std::string safe;
  bool beginsCell = true;
  while (!value.empty()) {
    if (beginsCell && kFormulas.find(value.front()) != std::string_view::npos) safe += '\'';
    // Where a spreadsheet's language separates cells by semicolons, quotation marks after a comma
    // are within a cell, and a line end between them begins another one.
    beginsCell = std::string_view(";\r\n").find(value.front()) != std::string_view::npos;
    const char32_t codePoint = takeCodePoint(value);
    appendCodePoint(safe, isControl(codePoint) ? kReplacementCharacter : codePoint);
  }
  return title(safe);
}

CsvWriter& CsvWriter::real(double value) {
  separate();
  if (!std::isfinite(value)) return *this;
  std::array<char, 32> text;
  const auto [end, error] = std::to_chars(text.data(), text.data() + text.size(), value);
  out_.write(text.data(), end - text.data());
  return *this;
}

CsvWriter& CsvWriter::integer(std::int64_t value) {
  separate();
  out_ << value;
  return *this;
}

CsvWriter& CsvWriter::integer(std::uint64_t value) {
  separate();
  out_ << value;
  return *this;
}

CsvWriter& CsvWriter::nothing() {
  separate();
  return *this;
}

void CsvWriter::endRow() {
  out_ << "\r\n";
  isFirst_ = true;
}

void CsvWriter::titles(std::initializer_list<std::string_view> columns) {
  for (const std::string_view column : columns)
    title(column);
  endRow();
}

}  // namespace tavrel::fleet
