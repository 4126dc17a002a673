#include "tools/stat/import_number.h"

#include <bit>
#include <cctype>
#include <charconv>
#include <cmath>
#include <cstdint>
#include <cstdlib>
#include <optional>
#include <strings.h>

#include "base/format.h"
#include "base/parse_number.h"

namespace tavrel {
namespace {

constexpr std::uint64_t kSign = std::uint64_t{1} << 63;
constexpr std::uint64_t kQuietNan = 0x7FF8000000000000;
constexpr std::uint64_t kInfinity = 0x7FF0000000000000;
constexpr std::uint64_t kQuietPayload = (std::uint64_t{1} << 51) - 1;

// The not-a-number for "nan" or "nan(BITS)", with or without a sign; nothing for any other text.
// Bits that are not a number are ignored, as strtod does.
std::optional<double> parseNan(std::string_view text) {
  const bool negative = text.starts_with('-');
  if (negative || text.starts_with('+')) text.remove_prefix(1);
  if (text.size() < 3 || strncasecmp(text.data(), "nan", 3) != 0) return std::nullopt;
  text.remove_prefix(3);
  std::uint64_t bits = 0;
  if (!text.empty()) {
    if (!text.starts_with('(') || !text.ends_with(')')) return std::nullopt;
    const std::string number(text.substr(1, text.size() - 2));
    for (const char character : number) {
      if (std::isalnum(static_cast<unsigned char>(character)) == 0 && character != '_') {
        return std::nullopt;
      }
    }
    char* end = nullptr;
    bits = std::strtoull(number.c_str(), &end, 0);
    if (*end != '\0') bits = 0;
  }
  const bool isWhole = bits > kInfinity && bits < kSign;
  bits = isWhole ? bits : kQuietNan | (bits & kQuietPayload);
  return std::bit_cast<double>(negative ? bits | kSign : bits);
}

}  // namespace

Expected<double> parseExactDouble(std::string_view text) {
  const auto plain = parseNumber<double>(text);
  if (plain && !std::isnan(*plain)) return *plain;

  // Rare forms, for which a copy does not matter.
  constexpr std::string_view kBlanks = " \t\n\v\f\r";
  const std::size_t first = text.find_first_not_of(kBlanks);
  if (first == std::string_view::npos) return Error{"a number is missing"};
  if (const auto nan = parseNan(text.substr(first))) return *nan;
  const std::string copy(text.substr(first));
  char* copyEnd = nullptr;
  const double value = std::strtod(copy.c_str(), &copyEnd);
  if (copyEnd != copy.c_str() + copy.size()) return Error{format("not a number: %s", text)};
  const bool isWritten = copy.find_first_of("iI") != std::string::npos;
  if (std::isinf(value) && !isWritten) {
    return Error{format("beyond the range of a double: %s", text)};
  }
  return value;
}

void appendExactDouble(std::string& out, double value) {
  const auto bits = std::bit_cast<std::uint64_t>(value);
  const std::uint64_t magnitude = bits & ~kSign;
  if (magnitude > kInfinity) {
    if (magnitude != bits) out += '-';
    out += "nan";
    const std::uint64_t payload = magnitude >= kQuietNan ? magnitude & kQuietPayload : magnitude;
    if (payload != 0) appendFormat(out, "(0x%llx)", payload);
    return;
  }
  char digits[32];
  const auto [end, error] = std::to_chars(digits, digits + sizeof digits, value);
  out.append(digits, end);
}

}  // namespace tavrel
