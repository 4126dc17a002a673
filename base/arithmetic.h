// Integer arithmetic whose result is defined for every argument.
#pragma once

#include <concepts>
#include <cstdint>
#include <limits>
#include <optional>

namespace tavrel {

/// 64-bit sums and differences in two's complement.
constexpr std::int64_t wrappingAdd(std::int64_t a, std::int64_t b) {
  return static_cast<std::int64_t>(static_cast<std::uint64_t>(a) + static_cast<std::uint64_t>(b));
}
constexpr std::int64_t wrappingSubtract(std::int64_t a, std::int64_t b) {
  return static_cast<std::int64_t>(static_cast<std::uint64_t>(a) - static_cast<std::uint64_t>(b));
}

/// The sum, or the number next to it that the type holds.
template <std::integral Number>
constexpr Number saturatingAdd(Number a, Number b) {
  Number sum{};
  if (!__builtin_add_overflow(a, b, &sum)) return sum;
  return b < 0 ? std::numeric_limits<Number>::min() : std::numeric_limits<Number>::max();
}

/// The previous day, in two's complement: the last 32-bit day precedes the first one.
constexpr std::int32_t previousDay(std::int32_t day) {
  return static_cast<std::int32_t>(static_cast<std::uint32_t>(day) - 1U);
}

/// A shift by 64 or more gives 0.
constexpr std::uint64_t shiftLeft(std::uint64_t value, unsigned bits) {
  return bits < 64 ? value << bits : 0;
}

/// The product of two sizes, or nothing when it would wrap.
constexpr std::optional<std::uint64_t> checkedMultiply(std::uint64_t a, std::uint64_t b) {
  if (b != 0 && a > std::numeric_limits<std::uint64_t>::max() / b) return std::nullopt;
  return a * b;
}

/// A double as a 64-bit integer: truncated, saturated at both ends, 0 for not-a-number.
constexpr std::int64_t saturatingInt64(double value) {
  constexpr double kTwoTo63 = 9223372036854775808.0;
  if (value != value) return 0;
  if (value >= kTwoTo63) return std::numeric_limits<std::int64_t>::max();
  if (value < -kTwoTo63) return std::numeric_limits<std::int64_t>::min();
  return static_cast<std::int64_t>(value);
}

/// The low half of a 64-bit integer, in two's complement.
constexpr std::int32_t lowInt32(std::int64_t value) {
  return static_cast<std::int32_t>(value);
}

}  // namespace tavrel
