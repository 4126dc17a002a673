#include "base/civil_time.h"

#include <cstdio>

#include "base/parse_number.h"

namespace tavrel {
namespace {

// The calendar repeats every 400 years. Counting years from March puts the leap day at the end.
constexpr std::int64_t kDaysPerEra = 146097;
constexpr std::int64_t kDaysFromEraStartTo1970 = 719468;  // 0000-03-01 to 1970-01-01

// Larger years would overflow an instant in 64-bit seconds.
constexpr std::int64_t kLargestYear = 1'000'000'000;

constexpr std::int64_t floorDivide(std::int64_t a, std::int64_t b) {
  return a / b - (a % b < 0 ? 1 : 0);
}

bool isLeapYear(std::int64_t year) {
  return year % 4 == 0 && (year % 100 != 0 || year % 400 == 0);
}

std::optional<std::int64_t> parseDigits(std::string_view text) {
  return text.starts_with('-') ? std::nullopt : parseNumber<std::int64_t>(text);
}

}  // namespace

CivilDate civilFromDays(std::int64_t days) {
  const std::int64_t shifted = days + kDaysFromEraStartTo1970;
  const std::int64_t era = floorDivide(shifted, kDaysPerEra);
  const std::int64_t dayOfEra = shifted - era * kDaysPerEra;
  const std::int64_t yearOfEra =
      (dayOfEra - dayOfEra / 1460 + dayOfEra / 36524 - dayOfEra / 146096) / 365;
  const std::int64_t dayOfYear = dayOfEra - (365 * yearOfEra + yearOfEra / 4 - yearOfEra / 100);
  const std::int64_t monthFromMarch = (5 * dayOfYear + 2) / 153;
  const auto day = static_cast<unsigned>(dayOfYear - (153 * monthFromMarch + 2) / 5 + 1);
  const auto month =
      static_cast<unsigned>(monthFromMarch < 10 ? monthFromMarch + 3 : monthFromMarch - 9);
  return {yearOfEra + era * 400 + (month <= 2 ? 1 : 0), month, day};
}

std::int64_t daysFromCivil(const CivilDate& date) {
  const std::int64_t year = date.year - (date.month <= 2 ? 1 : 0);
  const std::int64_t era = floorDivide(year, 400);
  const std::int64_t yearOfEra = year - era * 400;
  const std::int64_t monthFromMarch = date.month > 2 ? date.month - 3 : date.month + 9;
  const std::int64_t dayOfYear = (153 * monthFromMarch + 2) / 5 + date.day - 1;
  const std::int64_t dayOfEra = yearOfEra * 365 + yearOfEra / 4 - yearOfEra / 100 + dayOfYear;
  return era * kDaysPerEra + dayOfEra - kDaysFromEraStartTo1970;
}

CivilTime civilFromSeconds(std::int64_t seconds) {
  const unsigned second = secondOfDay(seconds);
  return {civilFromDays(dayOfSecond(seconds)), second / 3600, second / 60 % 60, second % 60};
}

std::int64_t secondsFromCivil(const CivilTime& time) {
  // Unsigned, because the first day of the 64-bit range is only partly inside it.
  const auto days = static_cast<std::uint64_t>(daysFromCivil(time.date));
  return static_cast<std::int64_t>(days * kSecondsPerDay + time.hour * 3600ULL +
                                   time.minute * 60ULL + time.second);
}

std::int64_t dayOfSecond(std::int64_t seconds) {
  return floorDivide(seconds, kSecondsPerDay);
}

unsigned secondOfDay(std::int64_t seconds) {
  const std::int64_t remainder = seconds % kSecondsPerDay;
  return static_cast<unsigned>(remainder < 0 ? remainder + kSecondsPerDay : remainder);
}

bool isValid(const CivilDate& date) {
  static constexpr unsigned kDaysOfMonth[] = {31, 29, 31, 30, 31, 30, 31, 31, 30, 31, 30, 31};
  if (date.year < -kLargestYear || date.year > kLargestYear) return false;
  if (date.month < 1 || date.month > 12 || date.day < 1) return false;
  if (date.month == 2 && date.day == 29) return isLeapYear(date.year);
  return date.day <= kDaysOfMonth[date.month - 1];
}

std::string dateText(const CivilDate& date) {
  char text[48];
  const bool negative = date.year < 0;
  const int length = std::snprintf(text, sizeof text, "%s%04lld-%02u-%02u", negative ? "-" : "",
                                   static_cast<long long>(negative ? -date.year : date.year),
                                   date.month, date.day);
  return {text, static_cast<std::size_t>(length)};
}

std::optional<CivilDate> parseDate(std::string_view text) {
  const std::string_view whole = text;
  const bool negative = text.starts_with('-');
  if (negative) text.remove_prefix(1);
  if (text.size() < 10 || text.size() > 16) return std::nullopt;
  const std::size_t yearLength = text.size() - 6;
  if (text[yearLength] != '-' || text[yearLength + 3] != '-') return std::nullopt;
  const auto year = parseDigits(text.substr(0, yearLength));
  const auto month = parseDigits(text.substr(yearLength + 1, 2));
  const auto day = parseDigits(text.substr(yearLength + 4, 2));
  if (!year || !month || !day) return std::nullopt;
  const CivilDate date{negative ? -*year : *year, static_cast<unsigned>(*month),
                       static_cast<unsigned>(*day)};
  if (!isValid(date) || dateText(date) != whole) return std::nullopt;
  return date;
}

}  // namespace tavrel
