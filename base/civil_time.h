// Days and instants without the C library's limits: every 32-bit day number has a date.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace tavrel {

inline constexpr std::int64_t kSecondsPerDay = 86400;

/// A date of the proleptic Gregorian calendar; year 0 is 1 BC.
struct CivilDate {
  std::int64_t year;
  unsigned month;  // 1 to 12
  unsigned day;    // 1 to 31

  bool operator==(const CivilDate&) const = default;
};

/// A date with a time of day, in UTC.
struct CivilTime {
  CivilDate date;
  unsigned hour;
  unsigned minute;
  unsigned second;

  bool operator==(const CivilTime&) const = default;
};

/// Converts days since 1970-01-01 to a date and back, for any day whose year fits 40 bits.
CivilDate civilFromDays(std::int64_t days);
std::int64_t daysFromCivil(const CivilDate& date);

/// Converts seconds since 1970-01-01 00:00:00 UTC to a date's fields and back, for any 64-bit
/// value.
CivilTime civilFromSeconds(std::int64_t seconds);
std::int64_t secondsFromCivil(const CivilTime& time);

/// The UTC day of an instant, and the seconds since its midnight, for any 64-bit instant.
std::int64_t dayOfSecond(std::int64_t seconds);
unsigned secondOfDay(std::int64_t seconds);

/// True for a date that exists in the calendar.
bool isValid(const CivilDate& date);

/// "2026-11-16"; years outside 0 to 9999 are written in full, with their sign when negative.
std::string dateText(const CivilDate& date);

/// Reads "YYYY-MM-DD" as `dateText` writes it; nothing for any other text.
std::optional<CivilDate> parseDate(std::string_view text);

}  // namespace tavrel
