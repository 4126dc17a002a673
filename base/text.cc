#include "base/text.h"

#include <charconv>
#include <cmath>
#include <cstdio>

#include "base/utf8.h"

namespace tavrel {
namespace {

using plist::Kind;

// Up to this number every integer is exact as a double, so its digits read back to it.
constexpr double kLargestPlainInteger = 9007199254740992.0;

// The range of the calendar in base/civil_time.h, in seconds either side of the epoch, rounded up.
constexpr double kLargestSeconds = 3.2e16;

template <class Integer>
std::string integerText(Integer value) {
  char digits[24];
  const auto [end, error] = std::to_chars(digits, digits + sizeof digits, value);
  return {digits, end};
}

void appendQuotedText(std::string& out, const plist::Value& value);

void appendDictionary(std::string& out, const plist::Dictionary& dictionary) {
  out += '{';
  const char* separator = "";
  for (const plist::Entry& entry : dictionary) {
    out += separator;
    separator = ", ";
    appendQuoted(out, entry.key);
    out += ": ";
    appendQuotedText(out, entry.value);
  }
  out += '}';
}

void appendArray(std::string& out, const plist::Array& array) {
  out += '[';
  const char* separator = "";
  for (const plist::Value& value : array) {
    out += separator;
    separator = ", ";
    appendQuotedText(out, value);
  }
  out += ']';
}

// The text of a value inside a container.
void appendQuotedText(std::string& out, const plist::Value& value) {
  switch (value.kind()) {
    case Kind::String:
      appendQuoted(out, *value.string());
      break;
    case Kind::Date:
    case Kind::Data:
      out += '"';
      appendText(out, value);
      out += '"';
      break;
    default:
      appendText(out, value);
  }
}

}  // namespace

std::string numberText(double value) {
  if (std::isnan(value)) return "nan";
  const bool negativeZero = value == 0 && std::signbit(value);
  if (std::abs(value) <= kLargestPlainInteger && std::trunc(value) == value && !negativeZero) {
    return integerText(static_cast<std::int64_t>(value));
  }
  char digits[32];
  const auto [end, error] = std::to_chars(digits, digits + sizeof digits, value);
  return {digits, end};
}

std::string numberText(const plist::Number& value) {
  switch (value.kind()) {
    case plist::NumberKind::Float:
    case plist::NumberKind::Double:
      return numberText(value.real());
    case plist::NumberKind::UInt64:
      return integerText(static_cast<std::uint64_t>(value.int64()));
    default:
      return integerText(value.int64());
  }
}

std::optional<CivilTime> civilTimeOf(plist::Date instant) {
  // Seconds since 1970 would be rounded.
  const double seconds = std::floor(instant.secondsSinceEpoch());
  if (!(std::abs(seconds) <= kLargestSeconds)) return std::nullopt;
  constexpr auto kEpoch = static_cast<std::int64_t>(plist::Date::kEpoch);
  const CivilTime time = civilFromSeconds(static_cast<std::int64_t>(seconds) + kEpoch);
  if (!isValid(time.date)) return std::nullopt;
  return time;
}

std::string dateText(plist::Date date) {
  const auto time = civilTimeOf(date);
  if (!time) return std::string("@").append(numberText(std::floor(date.secondsSince1970())));
  char clock[24];
  std::snprintf(clock, sizeof clock, " %02u:%02u:%02u +0000", time->hour, time->minute,
                time->second);
  return dateText(time->date) + clock;
}

void appendHex(std::string& out, ByteSpan bytes) {
  static constexpr char kDigits[] = "0123456789abcdef";
  for (const std::byte byte : bytes) {
    const auto bits = std::to_integer<unsigned>(byte);
    out += kDigits[bits >> 4];
    out += kDigits[bits & 0xF];
  }
}

void appendQuoted(std::string& out, std::string_view text) {
  out += '"';
  while (!text.empty()) {
    const char32_t codePoint = takeCodePoint(text);
    switch (codePoint) {
      case '"':
        out += "\\\"";
        break;
      case '\\':
        out += "\\\\";
        break;
      case '\n':
        out += "\\n";
        break;
      case '\r':
        out += "\\r";
        break;
      case '\t':
        out += "\\t";
        break;
      default:
        if (codePoint < 0x20 || codePoint == 0x7F) {
          char escape[8];
          std::snprintf(escape, sizeof escape, "\\u%04x", static_cast<unsigned>(codePoint));
          out += escape;
        } else {
          appendCodePoint(out, codePoint);
        }
    }
  }
  out += '"';
}

std::string quotedText(std::string_view text) {
  std::string out;
  appendQuoted(out, text);
  return out;
}

void appendText(std::string& out, const plist::Value& value) {
  switch (value.kind()) {
    case Kind::Null:
      out += "(null)";
      break;
    case Kind::Boolean:
      out += *value.boolean() ? '1' : '0';
      break;
    case Kind::Number:
      out += numberText(*value.number());
      break;
    case Kind::Date:
      out += dateText(*value.date());
      break;
    case Kind::String:
      out += *value.string();
      break;
    case Kind::Data:
      out += '<';
      appendHex(out, value.data().bytes());
      out += '>';
      break;
    case Kind::Array:
      appendArray(out, value.array());
      break;
    case Kind::Dictionary:
      appendDictionary(out, value.dictionary());
      break;
  }
}

std::string textOf(const plist::Value& value) {
  std::string text;
  appendText(text, value);
  return text;
}

}  // namespace tavrel
