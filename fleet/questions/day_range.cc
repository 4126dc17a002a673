#include "fleet/questions/day_range.h"

#include <optional>

#include "base/civil_time.h"
#include "base/parse_number.h"

namespace tavrel::fleet {

namespace {

std::optional<std::int32_t> parseDate32(std::string_view text) {
  const auto date = parseDate(text);
  if (!date) return std::nullopt;
  const std::int64_t day = daysFromCivil(*date);
  if (day != static_cast<std::int32_t>(day)) return std::nullopt;
  return static_cast<std::int32_t>(day);
}

}  // namespace

std::string textOf(const DayRange& days) {
  const DayRange all;
  if (days == all) return "all days";
  const std::string first = days.first == all.first ? "" : dateText(civilFromDays(days.first));
  const std::string last = days.last == all.last ? "" : dateText(civilFromDays(days.last));
  return first == last ? first : first + ".." + last;
}

Expected<DayRange> parseDayRange(std::string_view text, std::int32_t newest) {
  const Error fault{
      "\"" + std::string(text) +
      "\" is not a range of days: write FIRST..LAST with days as YYYY-MM-DD, or a number of days"};
  if (const auto count = parseNumber<std::uint32_t>(text)) {
    const std::int64_t first = static_cast<std::int64_t>(newest) - *count + 1;
    if (*count == 0 || first < DayRange{}.first) return fault;
    return DayRange{static_cast<std::int32_t>(first), newest};
  }

  const std::size_t dots = text.find("..");
  DayRange days;
  const auto read = [](std::string_view part, std::int32_t& day) {
    if (part.empty()) return true;
    const auto parsed = parseDate32(part);
    if (parsed) day = *parsed;
    return parsed.has_value();
  };
  if (text.empty() || !read(text.substr(0, dots), days.first)) return fault;
  if (dots == std::string_view::npos) {
    days.last = days.first;
  } else if (!read(text.substr(dots + 2), days.last)) {
    return fault;
  }
  if (days.first > days.last) {
    return Error{"\"" + std::string(text) + "\" ends before it begins: swap the two days"};
  }
  return days;
}

}  // namespace tavrel::fleet
