#include "fleet/questions/wide_sum.h"

#include <algorithm>
#include <bit>
#include <cmath>
#include <vector>

namespace tavrel::fleet {

namespace {

constexpr int kSignificantBits = 53;
constexpr int kSmallestExponent = -1074;  // of the last bit of the smallest double

std::uint64_t limbAt(std::span<const std::uint64_t> limbs, std::ptrdiff_t index) {
  return index >= 0 && index < std::ssize(limbs) ? limbs[static_cast<std::size_t>(index)] : 0;
}

/// The 64 bits that begin at `bit`, which is not negative.
std::uint64_t bitsFrom(std::span<const std::uint64_t> limbs, std::ptrdiff_t bit) {
  const auto shift = static_cast<unsigned>(bit % 64);
  const std::uint64_t low = limbAt(limbs, bit / 64) >> shift;
  return shift == 0 ? low : low | limbAt(limbs, bit / 64 + 1) << (64 - shift);
}

bool anyBitBelow(std::span<const std::uint64_t> limbs, std::ptrdiff_t bit) {
  for (std::ptrdiff_t i = 0; i < std::ssize(limbs) && i * 64 < bit; ++i) {
    const std::ptrdiff_t wanted = bit - i * 64;
    const std::uint64_t mask = wanted >= 64 ? ~std::uint64_t{0} : (std::uint64_t{1} << wanted) - 1;
    if ((limbAt(limbs, i) & mask) != 0) return true;
  }
  return false;
}

}  // namespace

bool subtract(std::span<const std::uint64_t> a, std::span<const std::uint64_t> b,
              std::span<std::uint64_t> result) {
  const bool isNegative = std::lexicographical_compare(a.rbegin(), a.rend(), b.rbegin(), b.rend());
  const auto larger = isNegative ? b : a;
  const auto smaller = isNegative ? a : b;
  std::uint64_t borrow = 0;
  for (std::size_t i = 0; i < result.size(); ++i) {
    const Uint128 difference = static_cast<Uint128>(larger[i]) - smaller[i] - borrow;
    result[i] = lowHalf(difference);
    borrow = highHalf(difference) != 0 ? 1 : 0;
  }
  return isNegative;
}

double nearestQuotient(std::span<const std::uint64_t> number, std::uint64_t divisor, int exponent,
                       bool isNegative) {
  // With two more limbs below the number, every quotient other than 0 has more than 64 bits, and a
  // remainder, at least 1 / 2^64 of the number's last bit, still shows in one of them.
  constexpr std::size_t kExtra = 2;
  std::vector<std::uint64_t> quotient(number.size() + kExtra);
  Uint128 remainder = 0;
  std::ptrdiff_t top = -1;
  for (std::size_t i = quotient.size(); i-- > 0;) {
    const Uint128 part = remainder << 64 | (i < kExtra ? 0 : number[i - kExtra]);
    quotient[i] = lowHalf(part / divisor);
    remainder = part % divisor;
    if (top < 0 && quotient[i] != 0) {
      top = static_cast<std::ptrdiff_t>(i * 64 + std::bit_width(quotient[i])) - 1;
    }
  }
  if (top < 0) return 0;

  const std::ptrdiff_t lowest = exponent - 64 * static_cast<std::ptrdiff_t>(kExtra);
  const std::ptrdiff_t last =
      std::max<std::ptrdiff_t>(top + lowest - (kSignificantBits - 1), kSmallestExponent);
  const std::ptrdiff_t shift = last - lowest;
  std::uint64_t mantissa = bitsFrom(quotient, shift);
  const bool half = (bitsFrom(quotient, shift - 1) & 1) != 0;
  const bool more = anyBitBelow(quotient, shift - 1);
  if (half && (more || (mantissa & 1) != 0)) ++mantissa;
  const double result = std::ldexp(static_cast<double>(mantissa), static_cast<int>(last));
  return isNegative ? -result : result;
}

}  // namespace tavrel::fleet
