#include "tools/stat/import_lines.h"

#include <algorithm>
#include <charconv>

#include "base/civil_time.h"
#include "base/format.h"
#include "base/limits.h"
#include "base/parse_number.h"
#include "base/utf8.h"
#include "tools/console/day_argument.h"
#include "tools/stat/import_number.h"

namespace tavrel {
namespace {

// Room for everything besides the key: kind, day, numbers and tabs.
constexpr std::size_t kLongestLine = limits::kStoreKeyBytes + 4096;

// A long text would bury the rest of the message.
std::string_view shortened(std::string_view text) {
  return text.substr(0, 60);
}

// Takes the text before the next tab off the front. False when there is no tab.
bool takeField(std::string_view& rest, std::string_view& field) {
  const std::size_t tab = rest.find('\t');
  if (tab == std::string_view::npos) return false;
  field = rest.substr(0, tab);
  rest.remove_prefix(tab + 1);
  return true;
}

bool isUtf8(std::string_view text) {
  const bool isAscii = std::all_of(text.begin(), text.end(), [](char character) {
    return static_cast<unsigned char>(character) < 0x80;
  });
  return isAscii || isValidUtf8(text);
}

template <class Integer>
void appendInteger(std::string& out, Integer value) {
  char digits[24];
  const auto [end, error] = std::to_chars(digits, digits + sizeof digits, value);
  out.append(digits, end);
}

void appendStart(std::string& out, std::string_view kind, std::int32_t day, std::string_view key) {
  out += kind;
  appendInteger(out, day);
  out += '\t';
  out += key;
  out += '\t';
}

}  // namespace

Expected<ImportLine> parseImportLine(std::string_view line, std::int32_t today) {
  if (line.empty()) return Error{"the line is empty"};
  ImportLine result;
  std::string_view rest = line;
  std::string_view kind;
  takeField(rest, kind);
  const bool isScalar = kind == "scalar";
  if (!isScalar && kind != "value") {
    return Error{format("a line begins with \"scalar\" or \"value\" and a tab, not with: %s",
                        shortened(line))};
  }
  result.kind = isScalar ? ImportLine::Kind::Scalar : ImportLine::Kind::Value;

  std::string_view day;
  std::string_view seconds;
  if (!takeField(rest, day) || !takeField(rest, result.key) ||
      (!isScalar && !takeField(rest, seconds)) || rest.find('\t') != std::string_view::npos) {
    return Error{isScalar ? "a scalar has four fields, separated by tabs: scalar, day, key, integer"
                          : "a value has five fields, separated by tabs: value, day, key, seconds, "
                            "number"};
  }
  const auto parsedDay = parseDay(day, today);
  if (!parsedDay) return parsedDay.error();
  result.day = *parsedDay;
  if (result.key.empty()) return Error{"the key is empty"};
  if (result.key.size() > limits::kStoreKeyBytes) {
    return Error{format("a key of %zu bytes: the longest allowed has %zu", result.key.size(),
                        limits::kStoreKeyBytes)};
  }
  if (!isUtf8(result.key)) return Error{format("a key is not UTF-8: %s", shortened(result.key))};

  if (isScalar) {
    const auto integer = parseNumber<std::int64_t>(rest);
    if (!integer) return Error{format("not a 64-bit integer: %s", shortened(rest))};
    result.integer = *integer;
    return result;
  }
  const auto secondsInDay = parseNumber<std::uint32_t>(seconds);
  if (!secondsInDay || *secondsInDay >= kSecondsPerDay) {
    return Error{format("seconds within the day are 0 to 86399, not: %s", shortened(seconds))};
  }
  result.seconds = *secondsInDay;
  const auto value = parseExactDouble(rest);
  if (!value) return value.error();
  result.value = *value;
  return result;
}

Status ImportParser::takeLine(std::string_view line, const Sink& sink) {
  ++lines_;
  const auto parsed = parseImportLine(line, today_);
  if (!parsed) return parsed.error();
  return sink(*parsed);
}

Status ImportParser::feed(std::string_view bytes, const Sink& sink) {
  std::size_t end = bytes.find('\n');
  if (!begun_.empty() && end != std::string_view::npos) {
    begun_ += bytes.substr(0, end);
    if (Status taken = takeLine(begun_, sink); !taken) return taken;
    begun_.clear();
    bytes.remove_prefix(end + 1);
    end = bytes.find('\n');
  }
  while (end != std::string_view::npos) {
    if (Status taken = takeLine(bytes.substr(0, end), sink); !taken) return taken;
    bytes.remove_prefix(end + 1);
    end = bytes.find('\n');
  }
  begun_ += bytes;
  if (begun_.size() > kLongestLine) {
    ++lines_;
    return Error{format("a line has more than %zu bytes", kLongestLine)};
  }
  return Done{};
}

Status ImportParser::finish(const Sink& sink) {
  if (begun_.empty()) return Done{};
  return takeLine(begun_, sink);
}

bool isExportable(std::string_view key) {
  return !key.empty() && key.find_first_of("\t\n") == std::string_view::npos && isUtf8(key);
}

void appendScalarLine(std::string& out, std::int32_t day, std::string_view key,
                      std::int64_t integer) {
  appendStart(out, "scalar\t", day, key);
  appendInteger(out, integer);
  out += '\n';
}

void appendValueLine(std::string& out, std::int32_t day, std::string_view key,
                     std::uint32_t seconds, double value) {
  appendStart(out, "value\t", day, key);
  appendInteger(out, seconds);
  out += '\t';
  appendExactDouble(out, value);
  out += '\n';
}

}  // namespace tavrel
