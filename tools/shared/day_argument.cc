#include "tools/shared/day_argument.h"

#include <charconv>
#include <limits>

#include "base/arithmetic.h"
#include "base/format.h"

namespace tavrel {

Expected<std::int32_t> parseDay(std::string_view text, std::optional<std::int32_t> today) {
  if (today && text == "today") return *today;
  if (today && text == "yesterday") return previousDay(*today);

  std::int32_t day = 0;
  const char* const end = text.data() + text.size();
  const auto [stop, error] = std::from_chars(text.data(), end, day);
  if (error == std::errc() && stop == end) return day;

  if (const auto date = parseDate(text)) {
    const std::int64_t days = daysFromCivil(*date);
    if (days >= std::numeric_limits<std::int32_t>::min() &&
        days <= std::numeric_limits<std::int32_t>::max()) {
      return static_cast<std::int32_t>(days);
    }
  }
  return Error{format("not a day: %s: give %sa 32-bit day number or YYYY-MM-DD", text,
                      today ? "today, yesterday, " : "")};
}

std::string dayText(std::int32_t day) {
  return format("%d (%s)", day, dayDateText(day));
}

}  // namespace tavrel
