// The text format for importing and exporting statistics, one row per line:
//
//   scalar<TAB>DAY<TAB>KEY<TAB>INTEGER
//   value<TAB>DAY<TAB>KEY<TAB>SECONDS<TAB>DOUBLE
//
// DAY is a number of days since 1970-01-01, YYYY-MM-DD, "today" or "yesterday"; KEY is non-empty
// UTF-8 without tabs and line ends; SECONDS is the offset within the day, below 86400; DOUBLE has
// one of the forms in tools/stat/import_number.h.
#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>

#include "base/expected.h"

namespace tavrel {

struct ImportLine {
  enum class Kind : std::uint8_t { Scalar, Value };

  Kind kind = Kind::Scalar;
  std::int32_t day = 0;
  std::string_view key;       // borrowed from the line
  std::int64_t integer = 0;   // of a scalar
  std::uint32_t seconds = 0;  // of a value
  double value = 0;           // of a value
};

/// Parses one line, without its line end. The error says what is wrong.
Expected<ImportLine> parseImportLine(std::string_view line, std::int32_t today);

/// Splits a stream into lines and parses each.
class ImportParser {
 public:
  using Sink = std::function<Status(const ImportLine& line)>;

  /// `today` is the number of the current day.
  explicit ImportParser(std::int32_t today) : today_(today) {}

  /// Takes the next bytes. Stops at the first line that is malformed or that the sink refuses.
  Status feed(std::string_view bytes, const Sink& sink);
  /// Takes the last line when the stream does not end with a line end.
  Status finish(const Sink& sink);

  /// Lines taken so far, including the one at which it stopped.
  std::uint64_t lines() const { return lines_; }

 private:
  Status takeLine(std::string_view line, const Sink& sink);

  const std::int32_t today_;
  std::string begun_;  // of a line that is not complete yet
  std::uint64_t lines_ = 0;
};

/// False for a key that the format cannot represent.
bool isExportable(std::string_view key);

void appendScalarLine(std::string& out, std::int32_t day, std::string_view key,
                      std::int64_t integer);
void appendValueLine(std::string& out, std::int32_t day, std::string_view key,
                     std::uint32_t seconds, double value);

}  // namespace tavrel
