#include "platform/plist/scalar_text.h"

#include <charconv>
#include <cmath>
#include <cstdint>
#include <limits>

#include "base/parse_number.h"

namespace tavrel::plist {
namespace {

template <class Value>
void append(std::string& out, Value value) {
  char digits[32];
  const auto [end, error] = std::to_chars(digits, digits + sizeof digits, value);
  out.append(digits, end);
}

bool take(std::string_view& text, char first) {
  if (!text.starts_with(first)) return false;
  text.remove_prefix(1);
  return true;
}

bool takeHexadecimalMark(std::string_view& text) {
  if (text.size() < 2 || text[0] != '0' || (text[1] != 'x' && text[1] != 'X')) return false;
  text.remove_prefix(2);
  return true;
}

}  // namespace

void appendNumber(std::string& out, const Number& number) {
  if (number.isFloating()) {
    if (std::isnan(number.real())) {
      out += "nan";
    } else {
      append(out, number.real());
    }
  } else if (number.kind() == NumberKind::UInt64) {
    append(out, static_cast<std::uint64_t>(number.int64()));
  } else {
    append(out, number.int64());
  }
}

std::optional<Number> parseInteger(std::string_view text) {
  const bool negative = take(text, '-');
  if (!negative) take(text, '+');
  const bool hexadecimal = takeHexadecimalMark(text);
  const auto magnitude = parseNumber<std::uint64_t>(text, hexadecimal ? 16 : 10);
  if (!magnitude) return std::nullopt;
  constexpr auto kLargest = std::uint64_t{std::numeric_limits<std::int64_t>::max()};
  if (negative) {
    if (*magnitude > kLargest + 1) return std::nullopt;
    return Number(static_cast<std::int64_t>(-*magnitude));
  }
  if (*magnitude > kLargest) return Number(*magnitude);
  return Number(static_cast<std::int64_t>(*magnitude));
}

std::optional<double> parseReal(std::string_view text) {
  if (take(text, '+') && text.starts_with('-')) return std::nullopt;
  if (text.ends_with(')')) return std::nullopt;  // "nan(...)"
  return parseNumber<double>(text);
}

}  // namespace tavrel::plist
