#include "ioreport/units.h"

#include <algorithm>
#include <cmath>
#include <limits>
#include <span>

#include "base/arithmetic.h"
#include "ioreport/allocation.h"
#include "ioreport/channel.h"
#include "ioreport/keys.h"
#include "ioreport/unit_tables.h"

namespace tavrel {
namespace {

constexpr std::uint32_t kFactorMask = 0x7FFFFFFF;
constexpr std::uint32_t kFactorDivides = 0x80000000;

constexpr std::uint32_t factorWordOf(std::uint64_t unit) {
  return static_cast<std::uint32_t>(unit);
}
constexpr std::uint32_t scaleOf(std::uint64_t unit) {
  return static_cast<std::uint32_t>(unit >> 32) & 0xFFFFFF;
}
constexpr std::uint8_t quantityOf(std::uint64_t unit) {
  return static_cast<std::uint8_t>(unit >> 56);
}

std::optional<std::string_view> labelIn(std::span<const ScaleLabel> table, std::uint64_t unit) {
  const auto row = std::ranges::find_if(table, [unit](const ScaleLabel& label) {
    return label.scale == scaleOf(unit) && label.factorWord == factorWordOf(unit);
  });
  if (row == table.end()) return std::nullopt;
  return row->text;
}

std::string_view suffixOf(std::uint64_t unit) {
  if (quantityOf(unit) == kQuantityData) return labelIn(kDataSuffixes, unit).value_or("");
  const auto* const row =
      std::ranges::find(kQuantitySuffixes, quantityOf(unit), &QuantitySuffix::quantity);
  return row == std::end(kQuantitySuffixes) ? kUnknownQuantity : row->text;
}

// The exponent in a byte of the scale, 0 when it has none. Without the bias, it is a signed 8-bit
// number.
constexpr std::int8_t exponentOf(std::uint32_t scaleByte) {
  return scaleByte == 0 ? std::int8_t{0} : static_cast<std::int8_t>(scaleByte - 127);
}

constexpr std::uint64_t timesPowerOfTen(std::uint64_t value, int exponent) {
  for (; exponent > 0; --exponent)
    value *= 10;
  return value;
}

struct Factors {
  double numerator;
  double denominator;
};

std::optional<Factors> factorsOf(std::uint64_t unit) {
  std::uint64_t numerator = 0;
  std::uint64_t denominator = 0;
  if (getFactorsFromScale(factorWordOf(unit), scaleOf(unit), numerator, denominator) !=
      kKernelSuccess) {
    return std::nullopt;
  }
  return Factors{static_cast<double>(numerator), static_cast<double>(denominator)};
}

}  // namespace

std::optional<std::string> copyUnitLabel(std::int64_t unit) {
  if (unit == kInvalidValue) return std::nullopt;
  const auto word = static_cast<std::uint64_t>(unit);
  if (const auto complete = labelIn(kCompleteLabels, word)) return std::string(*complete);
  std::string label(labelIn(kUnitPrefixes, word).value_or(""));
  return label += suffixOf(word);
}

std::optional<std::string_view> IOReportChannelGetUnitLabel(const plist::Dictionary& channel) {
  if (channel.contains(kUnitLabelKey)) return channel.string(kUnitLabelKey);
  return madeOrNull([&]() -> std::optional<std::string_view> {
    const auto label = copyUnitLabel(IOReportChannelGetUnit(channel));
    if (!label) return std::nullopt;
    return keepText(channel, kUnitLabelKey, *label);
  });
}

KernelReturn getFactorsFromScale(std::uint32_t factorWord, std::uint32_t scale,
                                 std::uint64_t& numerator, std::uint64_t& denominator) {
  if ((scale >> 16 & 0xFF) != 0) return kKernelBadArgument;
  const bool divides = (factorWord & kFactorDivides) != 0;
  const std::uint64_t factor = std::max(factorWord & kFactorMask, 1U);
  std::uint64_t up = divides ? 1 : factor;
  std::uint64_t down = divides ? factor : 1;

  const int tens = exponentOf(scale & 0xFF);
  up = timesPowerOfTen(up, tens);
  down = timesPowerOfTen(down, -tens);

  const int twos = exponentOf(scale >> 8 & 0xFF);
  if (twos > 0) up = shiftLeft(up, static_cast<unsigned>(twos));
  if (twos < 0) down = shiftLeft(down, static_cast<unsigned>(-twos));

  numerator = up;
  denominator = down;
  return kKernelSuccess;
}

bool hasExactFactors(std::uint64_t unit) {
  const auto factor = factorsOf(factorWordOf(unit));
  if (!factor || !factorsOf(unit)) return false;
  const int tens = exponentOf(scaleOf(unit) & 0xFF);
  const int twos = exponentOf(scaleOf(unit) >> 8 & 0xFF);
  // Floating point does not wrap.
  const auto powers = [](int ten, int two) {
    return std::pow(10.0, std::max(ten, 0)) * std::exp2(std::max(two, 0));
  };
  return factor->numerator * powers(tens, twos) < 0x1p64 &&
         factor->denominator * powers(-tens, -twos) < 0x1p64;
}

double IOReportScaleValue(std::uint64_t value, std::uint64_t fromUnit, std::uint64_t toUnit) {
  constexpr double kNotANumber = std::numeric_limits<double>::quiet_NaN();
  if (quantityOf(fromUnit) != quantityOf(toUnit)) return kNotANumber;
  const auto from = factorsOf(fromUnit);
  const auto to = factorsOf(toUnit);
  if (!from || !to) return kNotANumber;
  return static_cast<double>(value) * from->numerator / from->denominator / to->numerator *
         to->denominator;
}

}  // namespace tavrel
