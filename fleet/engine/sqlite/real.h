// Doubles as SQLite values that come back with the same bits.
//
// SQLite has no not-a-number: it stores null in its place. So the usual one, which parsers of
// numbers yield, is null, and others are blobs of their 8 bytes. Columns of doubles have no
// declared type, as the conversions of a REAL column lose the sign of zero.
#pragma once

#include <bit>
#include <cstdint>
#include <limits>

struct sqlite3_context;
struct sqlite3_value;

namespace tavrel::fleet {

inline constexpr double kUsualNan = std::numeric_limits<double>::quiet_NaN();

inline bool isUsualNan(double value) {
  return std::bit_cast<std::uint64_t>(value) == std::bit_cast<std::uint64_t>(kUsualNan);
}

double realOf(sqlite3_value* value);
void setResult(sqlite3_context* result, double value);

}  // namespace tavrel::fleet
