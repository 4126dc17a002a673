#include "fleet/questions/exact_moments.h"

#include <array>
#include <bit>
#include <cmath>
#include <limits>

namespace tavrel::fleet {

namespace {

// Times the square of a 53-bit mantissa, this makes 128 bits. Longer mantissas have a count of 1.
constexpr int kShortCountBits = 22;

constexpr double kNan = std::numeric_limits<double>::quiet_NaN();

/// The magnitude of a double: mantissa × 2^exponent.
struct Parts {
  std::uint64_t mantissa;
  int exponent;
};

Parts partsOf(double value) {
  constexpr int kMantissaBits = 52;
  const auto bits = std::bit_cast<std::uint64_t>(value);
  const std::uint64_t fraction = bits & ((std::uint64_t{1} << kMantissaBits) - 1);
  const auto biased = static_cast<int>(bits >> kMantissaBits & 0x7ff);
  if (biased == 0) return {fraction, -1074};
  return {fraction | std::uint64_t{1} << kMantissaBits, biased - 1075};
}

Product multiply(Uint128 a, std::uint64_t b) {
  const Uint128 low = static_cast<Uint128>(lowHalf(a)) * b;
  const Uint128 high = static_cast<Uint128>(highHalf(a)) * b + highHalf(low);
  return {lowHalf(low), lowHalf(high), highHalf(high)};
}

}  // namespace

bool ExactMoments::grow(std::uint64_t count) {
  if (overflowed_ || count > std::numeric_limits<std::uint64_t>::max() - count_) {
    count_ = std::numeric_limits<std::uint64_t>::max();
    overflowed_ = true;
    return false;
  }
  count_ += count;
  return true;
}

void ExactMoments::addTerm(std::uint64_t mantissa, int exponent, bool isNegative,
                           std::uint64_t count) {
  const auto bit = static_cast<std::size_t>(exponent - kLastBit);
  sum_.add(static_cast<Uint128>(mantissa) * count, bit, isNegative);
  const Uint128 square = static_cast<Uint128>(mantissa) * mantissa;
  if (count >> kShortCountBits == 0) {
    squares_.add(square * count, 2 * bit, false);
  } else {
    squares_.add(multiply(square, count), 2 * bit, false);
  }
}

void ExactMoments::add(double mean, double squaredDeviations, std::uint64_t count) {
  if (count == 0 || !grow(count)) return;
  Parts parts = partsOf(mean);
  addTerm(parts.mantissa, parts.exponent, std::signbit(mean), count);
  if (squaredDeviations == 0) return;
  parts = partsOf(squaredDeviations);
  squares_.add(Uint128{parts.mantissa}, static_cast<std::size_t>(parts.exponent - 2 * kLastBit),
               std::signbit(squaredDeviations));
}

void ExactMoments::add(std::int64_t value) {
  if (!grow(1)) return;
  const auto bits = static_cast<std::uint64_t>(value);
  addTerm(value < 0 ? -bits : bits, 0, value < 0, 1);
}

double ExactMoments::mean() const {
  if (count_ == 0 || overflowed_) return kNan;
  WideSum<kSumLimbs>::Limbs magnitude;
  const bool isNegative = subtract(sum_.positive(), sum_.negative(), magnitude);
  return nearestQuotient(magnitude, count_, kLastBit, isNegative);
}

double ExactMoments::differenceOfMeans(const ExactMoments& before, const ExactMoments& after) {
  std::uint64_t pairs = 0;
  if (before.count_ == 0 || after.count_ == 0 || before.overflowed_ || after.overflowed_ ||
      __builtin_mul_overflow(before.count_, after.count_, &pairs)) {
    return kNan;
  }
  // (sum after × count before - sum before × count after) / pairs
  std::array<std::uint64_t, kSumLimbs + 1> sums[2] = {};  // positive and negative terms
  const auto addTo = [](auto& result, const auto& limbs, std::uint64_t count) {
    Uint128 carry = 0;
    for (std::size_t i = 0; i < kSumLimbs; ++i) {
      carry += static_cast<Uint128>(limbs[i]) * count + result[i];
      result[i] = lowHalf(carry);
      carry >>= 64;
    }
    result[kSumLimbs] += lowHalf(carry);
  };
  addTo(sums[0], after.sum_.positive(), before.count_);
  addTo(sums[0], before.sum_.negative(), after.count_);
  addTo(sums[1], after.sum_.negative(), before.count_);
  addTo(sums[1], before.sum_.positive(), after.count_);
  std::array<std::uint64_t, kSumLimbs + 1> magnitude;
  const bool isNegative = subtract(sums[0], sums[1], magnitude);
  return nearestQuotient(magnitude, pairs, kLastBit, isNegative);
}

double ExactMoments::squaredDeviations() const {
  if (count_ == 0 || overflowed_) return kNan;

  // (count × squares - sum²) / count, exact up to the division.
  constexpr std::size_t kLimbs = 2 * kSumLimbs;
  static_assert(kLimbs > kSquaresLimbs);
  std::array<std::uint64_t, kLimbs> scaled[2] = {};
  const auto scale = [&](const auto& limbs, auto& result) {
    Uint128 carry = 0;
    for (std::size_t i = 0; i < kSquaresLimbs; ++i) {
      carry += static_cast<Uint128>(limbs[i]) * count_;
      result[i] = lowHalf(carry);
      carry >>= 64;
    }
    result[kSquaresLimbs] = lowHalf(carry);
  };
  scale(squares_.positive(), scaled[0]);
  scale(squares_.negative(), scaled[1]);

  WideSum<kSumLimbs>::Limbs sum;
  subtract(sum_.positive(), sum_.negative(), sum);
  for (std::size_t i = 0; i < kSumLimbs; ++i) {
    Uint128 carry = 0;
    std::array<std::uint64_t, kLimbs>& target = scaled[1];
    for (std::size_t j = 0; j < kSumLimbs; ++j) {
      carry += static_cast<Uint128>(sum[i]) * sum[j] + target[i + j];
      target[i + j] = lowHalf(carry);
      carry >>= 64;
    }
    for (std::size_t k = i + kSumLimbs; carry != 0 && k < kLimbs; ++k) {
      carry += target[k];
      target[k] = lowHalf(carry);
      carry >>= 64;
    }
  }
  std::array<std::uint64_t, kLimbs> magnitude;
  const bool isNegative = subtract(scaled[0], scaled[1], magnitude);
  return nearestQuotient(magnitude, count_, 2 * kLastBit, isNegative);
}

}  // namespace tavrel::fleet
