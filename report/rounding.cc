#include "report/rounding.h"

#include <cmath>
#include <iterator>

#include "base/arithmetic.h"
#include "config/bh_config.h"

namespace tavrel {
namespace {

// Powers of ten that are exact as doubles; the C library's pow need not be exact on every CPU.
constexpr double kExactPowersOfTen[] = {1e0,  1e1,  1e2,  1e3,  1e4,  1e5,  1e6,  1e7,
                                        1e8,  1e9,  1e10, 1e11, 1e12, 1e13, 1e14, 1e15,
                                        1e16, 1e17, 1e18, 1e19, 1e20, 1e21, 1e22};

double powerOfTen(std::int32_t exponent) {
  if (exponent < static_cast<std::int32_t>(std::size(kExactPowersOfTen))) {
    return kExactPowersOfTen[exponent];
  }
  return std::pow(10.0, exponent);
}

}  // namespace

std::int64_t roundToBucket(std::int64_t value, std::uint32_t width) {
  if (width == 0) return value;
  const std::int64_t shifted = wrappingAdd(value, width / 2);
  return shifted - shifted % width;
}

std::int64_t roundToSignificantFigures(std::int64_t value, std::uint32_t figures) {
  if (value == 0) return value;
  const auto real = static_cast<double>(value);
  const auto digits = static_cast<std::uint32_t>(std::ceil(std::log10(std::abs(real))));
  const auto drop = static_cast<std::int32_t>(digits - figures);
  if (drop < 1) return value;
  const double power = powerOfTen(drop);
  return saturatingInt64(power * std::round(real / power));
}

std::int64_t coarsened(std::int64_t value, const plist::Dictionary& options) {
  if (const auto width = options.number(kBucketIntervalOption)) {
    value = roundToBucket(value, width->uint32());
  }
  if (const auto figures = options.number(kSignificantFiguresOption)) {
    value = roundToSignificantFigures(value, figures->uint32());
  }
  return value;
}

}  // namespace tavrel
