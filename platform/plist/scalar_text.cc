#include "platform/plist/scalar_text.h"

#include <charconv>
#include <cmath>
#include <cstdint>
#include <limits>

#include "base/civil_time.h"
#include "base/format.h"

namespace tavrel::plist {
namespace {

constexpr auto kEpoch = static_cast<std::int64_t>(Date::kEpoch);

// Seconds from the epoch to the ends of the calendar of base/civil_time.h, rounded up.
constexpr double kLargestSeconds = 3.2e16;

template <class Value>
void append(std::string& out, Value value) {
  char digits[32];
  const auto [end, error] = std::to_chars(digits, digits + sizeof digits, value);
  out.append(digits, end);
}

// Reads the whole text.
template <class Value, class... Options>
std::optional<Value> parse(std::string_view text, Options... options) {
  Value value{};
  const char* const textEnd = text.data() + text.size();
  const auto [end, error] = std::from_chars(text.data(), textEnd, value, options...);
  if (error != std::errc{} || end != textEnd) return std::nullopt;
  return value;
}

bool takePrefix(std::string_view& text, std::string_view prefix) {
  if (!text.starts_with(prefix)) return false;
  text.remove_prefix(prefix.size());
  return true;
}

// Two digits at `position` that do not exceed `largest`.
std::optional<unsigned> parseTwoDigits(std::string_view text, std::size_t position,
                                       unsigned largest) {
  const auto value = parse<unsigned>(text.substr(position, 2));
  if (!value || *value > largest) return std::nullopt;
  return value;
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
  const bool negative = takePrefix(text, "-");
  if (!negative) takePrefix(text, "+");
  const bool hexadecimal = takePrefix(text, "0x") || takePrefix(text, "0X");
  const auto magnitude = parse<std::uint64_t>(text, hexadecimal ? 16 : 10);
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
  if (takePrefix(text, "+") && text.starts_with('-')) return std::nullopt;
  if (text.ends_with(')')) return std::nullopt;  // "nan(...)"
  return parse<double>(text);
}

bool appendDate(std::string& out, Date date) {
  const double seconds = std::floor(date.secondsSinceEpoch());
  if (!(std::abs(seconds) <= kLargestSeconds)) return false;
  const CivilTime time = civilFromSeconds(static_cast<std::int64_t>(seconds) + kEpoch);
  if (!isValid(time.date)) return false;
  out += dateText(time.date);
  appendFormat(out, "T%02u:%02u:%02uZ", time.hour, time.minute, time.second);
  return true;
}

std::optional<Date> parseDate(std::string_view text) {
  constexpr std::string_view kTime = "T00:00:00Z";
  if (text.size() < kTime.size()) return std::nullopt;
  const std::string_view time = text.substr(text.size() - kTime.size());
  for (const std::size_t position : {0U, 3U, 6U, 9U}) {
    if (time[position] != kTime[position]) return std::nullopt;
  }
  const auto date = tavrel::parseDate(text.substr(0, text.size() - kTime.size()));
  const auto hour = parseTwoDigits(time, 1, 23);
  const auto minute = parseTwoDigits(time, 4, 59);
  const auto second = parseTwoDigits(time, 7, 59);
  if (!date || !hour || !minute || !second) return std::nullopt;
  const std::int64_t seconds = secondsFromCivil({*date, *hour, *minute, *second});
  return Date::sinceEpoch(static_cast<double>(seconds - kEpoch));
}

}  // namespace tavrel::plist
