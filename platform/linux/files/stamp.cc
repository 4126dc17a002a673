#include "platform/linux/files/stamp.h"

#include "base/arithmetic.h"
#include "base/civil_time.h"
#include "base/format.h"
#include "base/instant.h"

namespace tavrel {

std::string compactStamp(plist::Date instant) {
  const CivilTime time = civilFromSeconds(wholeSeconds(instant));
  return format("%04lld%02u%02uT%02u%02u%02uZ", time.date.year, time.date.month, time.date.day,
                time.hour, time.minute, time.second);
}

std::optional<std::int64_t> dayInStamp(std::string_view stamp) {
  constexpr std::size_t kDateDigits = 8;
  if (stamp.size() <= kDateDigits || stamp[kDateDigits] != 'T') return std::nullopt;
  const auto date =
      parseDate(format("%s-%s-%s", stamp.substr(0, 4), stamp.substr(4, 2), stamp.substr(6, 2)));
  return date ? std::optional(daysFromCivil(*date)) : std::nullopt;
}

std::string preciseStamp(plist::Date instant) {
  const std::int64_t seconds = wholeSeconds(instant);
  const CivilTime time = civilFromSeconds(seconds);
  const double fraction = instant.secondsSince1970() - static_cast<double>(seconds);
  const auto milliseconds = static_cast<unsigned>(saturatingInt64(fraction * 1000.0)) % 1000U;
  return format("%sT%02u:%02u:%02u.%03uZ", dateText(time.date), time.hour, time.minute, time.second,
                milliseconds);
}

}  // namespace tavrel
