#include "base/iso_date.h"

#include <charconv>
#include <cmath>
#include <cstdint>

#include "base/format.h"
#include "base/parse_number.h"
#include "base/text.h"

namespace tavrel {
namespace {

constexpr auto kEpoch = static_cast<std::int64_t>(plist::Date::kEpoch);

// Two digits at `position` that do not exceed `largest`.
std::optional<unsigned> parseTwoDigits(std::string_view text, std::size_t position,
                                       unsigned largest) {
  const auto value = parseNumber<unsigned>(text.substr(position, 2));
  if (!value || *value > largest) return std::nullopt;
  return value;
}

// A fraction of a second: a point and digits.
std::optional<double> parseFraction(std::string_view text) {
  if (text.find_first_not_of("0123456789", 1) != std::string_view::npos) return std::nullopt;
  return parseNumber<double>(text);
}

std::optional<plist::Date> parseAnyForm(std::string_view text) {
  if (text.starts_with('@')) {
    const auto seconds = parseNumber<double>(text.substr(1));
    if (!seconds) return std::nullopt;
    return plist::Date::since1970(*seconds);
  }
  if (text.find('T') == std::string_view::npos)
    return parseIsoInstant(format("%sT00:00:00Z", text));
  const std::size_t point = text.find('.');
  if (point == std::string_view::npos) return parseIsoInstant(text);
  if (!text.ends_with('Z')) return std::nullopt;
  const auto whole = parseIsoInstant(format("%sZ", text.substr(0, point)));
  const auto fraction = parseFraction(text.substr(point, text.size() - 1 - point));
  if (!whole || !fraction) return std::nullopt;
  return plist::Date::sinceEpoch(whole->secondsSinceEpoch() + *fraction);
}

}  // namespace

bool appendIsoInstant(std::string& out, plist::Date instant) {
  const auto time = civilTimeOf(instant);
  if (!time) return false;
  out += dateText(time->date);
  appendFormat(out, "T%02u:%02u:%02uZ", time->hour, time->minute, time->second);
  return true;
}

std::optional<plist::Date> parseIsoInstant(std::string_view text) {
  constexpr std::string_view kTime = "T00:00:00Z";
  if (text.size() < kTime.size()) return std::nullopt;
  const std::string_view time = text.substr(text.size() - kTime.size());
  for (const std::size_t position : {0U, 3U, 6U, 9U}) {
    if (time[position] != kTime[position]) return std::nullopt;
  }
  const auto date = parseDate(text.substr(0, text.size() - kTime.size()));
  const auto hour = parseTwoDigits(time, 1, 23);
  const auto minute = parseTwoDigits(time, 4, 59);
  const auto second = parseTwoDigits(time, 7, 59);
  if (!date || !hour || !minute || !second) return std::nullopt;
  const std::int64_t seconds = secondsFromCivil({*date, *hour, *minute, *second});
  return plist::Date::sinceEpoch(static_cast<double>(seconds - kEpoch));
}

std::string isoDateText(plist::Date instant) {
  std::string text;
  if (!appendIsoInstant(text, instant)) return "@" + numberText(instant.secondsSince1970());
  const double seconds = instant.secondsSinceEpoch();
  const double fraction = seconds - std::floor(seconds);
  if (fraction == 0) return text;
  // Just before the epoch: the difference is rounded.
  if (fraction == 1) return isoDateText(plist::Date::sinceEpoch(std::floor(seconds) + 1));
  char digits[1100];
  const auto [end, error] =
      std::to_chars(digits, digits + sizeof digits, fraction, std::chars_format::fixed);
  text.pop_back();
  text.append(digits + 1, end);  // without the leading 0
  return text + 'Z';
}

Expected<plist::Date> parseIsoDate(std::string_view text) {
  const auto date = parseAnyForm(text);
  if (!date) {
    return Error{format("not a date: %s: give YYYY-MM-DDTHH:MM:SSZ or YYYY-MM-DD", text)};
  }
  return *date;
}

}  // namespace tavrel
