#include "tools/console/day_argument.h"

#include <limits>

#include "base/arithmetic.h"
#include "base/format.h"
#include "base/parse_number.h"

namespace tavrel {

Expected<std::int32_t> parseDay(std::string_view text, std::optional<std::int32_t> today) {
  if (today && text == "today") return *today;
  if (today && text == "yesterday") return previousDay(*today);

  if (const auto day = parseNumber<std::int32_t>(text)) return *day;
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
