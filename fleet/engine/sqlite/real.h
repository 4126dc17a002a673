// Doubles as SQLite values that come back with the same bits.
//
// SQLite has no not-a-number: it stores null instead. So null stands for the usual one, which
// number parsers yield, and any other is a blob of its 8 bytes, little-endian. Columns of
// doubles have no declared type, because the conversions of a REAL column lose the sign of zero.
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
