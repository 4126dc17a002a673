// Adds 128- and 192-bit products at any bit position of a wide fixed-point number. Nothing is
// rounded, so the order of the terms does not matter.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <span>

namespace tavrel::fleet {

__extension__ using Uint128 = unsigned __int128;

inline std::uint64_t lowHalf(Uint128 value) {
  return static_cast<std::uint64_t>(value);
}
inline std::uint64_t highHalf(Uint128 value) {
  return static_cast<std::uint64_t>(value >> 64);
}

/// Least significant limb first.
using Product = std::array<std::uint64_t, 3>;

/// Positive and negative terms are summed separately: a carry then travels far only as rarely as a
/// counter overflows. The caller must ensure that neither sum outgrows its limbs.
template <std::size_t kLimbs>
class WideSum {
 public:
  using Limbs = std::array<std::uint64_t, kLimbs>;

  /// Adds term × 2^bit, or subtracts it.
  void add(Uint128 term, std::size_t bit, bool isNegative) {
    std::uint64_t* limb = sums_[isNegative ? 1 : 0].data() + bit / 64;
    const unsigned shift = bit % 64;
    const Uint128 low = term << shift;
    const std::uint64_t high = shift == 0 ? 0 : highHalf(term) >> (64 - shift);
    Uint128 carry = 0;
    for (const std::uint64_t part : {lowHalf(low), highHalf(low), high}) {
      carry += static_cast<Uint128>(*limb) + part;
      *limb++ = lowHalf(carry);
      carry >>= 64;
    }
    for (; carry != 0; carry >>= 64) {
      carry += *limb;
      *limb++ = lowHalf(carry);
    }
  }
  void add(const Product& term, std::size_t bit, bool isNegative) {
    std::uint64_t* limb = sums_[isNegative ? 1 : 0].data() + bit / 64;
    const unsigned shift = bit % 64;
    Uint128 carry = 0;
    std::uint64_t spilled = 0;
    for (const std::uint64_t part : term) {
      const Uint128 shifted = static_cast<Uint128>(part) << shift;
      carry += static_cast<Uint128>(*limb) + (lowHalf(shifted) | spilled);
      spilled = highHalf(shifted);
      *limb++ = lowHalf(carry);
      carry >>= 64;
    }
    for (carry += spilled; carry != 0; carry >>= 64) {
      carry += *limb;
      *limb++ = lowHalf(carry);
    }
  }

  const Limbs& positive() const { return sums_[0]; }
  const Limbs& negative() const { return sums_[1]; }

 private:
  std::array<Limbs, 2> sums_{};
};

/// Sets result = |a - b| and returns whether a < b. All three have the same size.
bool subtract(std::span<const std::uint64_t> a, std::span<const std::uint64_t> b,
              std::span<std::uint64_t> result);

/// The double nearest to ±(number × 2^exponent / divisor), ties to even. The exponent may have any
/// value; beyond the range of a double, the result is an infinity. The divisor must not be 0.
double nearestQuotient(std::span<const std::uint64_t> number, std::uint64_t divisor, int exponent,
                       bool isNegative);

}  // namespace tavrel::fleet
