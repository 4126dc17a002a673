// Comma-separated values (RFC 4180).
#pragma once

#include <cstdint>
#include <initializer_list>
#include <iosfwd>
#include <string_view>

namespace tavrel::fleet {

class CsvWriter {
 public:
  explicit CsvWriter(std::ostream& out) : out_(out) {}

  /// Prefixes an apostrophe to outside text that a spreadsheet would run as a formula. Malformed
  /// bytes, and control characters other than tab and line ends, become replacement characters.
  CsvWriter& text(std::string_view value);
  /// A title, or text of our own.
  CsvWriter& title(std::string_view value);
  /// The shortest text that reads back to the same number; empty when it is not finite.
  CsvWriter& real(double value);
  CsvWriter& integer(std::int64_t value);
  CsvWriter& integer(std::uint64_t value);
  CsvWriter& nothing();
  void endRow();
  /// The first row.
  void titles(std::initializer_list<std::string_view> columns);

 private:
  void separate();

  std::ostream& out_;
  bool isFirst_ = true;
};

}  // namespace tavrel::fleet
