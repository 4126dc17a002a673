// Units: 64-bit codes of a quantity and a scale, their labels, and converting between them.
//
//   bits   0-30  an integer factor, 0 for 1
//   bit      31  set: the factor divides
//   bits  32-39  exponent of ten + 127, 0 for none
//   bits  40-47  exponent of two + 127, 0 for none
//   bits  48-55  special scale: ticks or pages of the hardware, which cannot be converted
//   bits  56-63  quantity; data is counted in bits
//
// So a unit of seconds with 0x7C in bits 32-39 is the millisecond: 1500 of them are 1.5 s.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "base/kernel_return.h"
#include "base/plist.h"

namespace tavrel {

inline constexpr std::uint64_t kUnitSeconds = std::uint64_t{1} << 56;

/// "KiB", "ms", "Hz"; nothing for the invalid value.
std::optional<std::string> copyUnitLabel(std::int64_t unit);

/// The label of the channel's unit, cached in the channel and borrowed from it.
std::optional<std::string_view> IOReportChannelGetUnitLabel(const plist::Dictionary& channel);

/// The factors by which values of a unit are multiplied and divided, as unsigned 64-bit words that
/// wrap. The factor word is bits 0-31 of the unit, the scale bits 32-55. Fails for special scales.
KernelReturn getFactorsFromScale(std::uint32_t factorWord, std::uint32_t scale,
                                 std::uint64_t& numerator, std::uint64_t& denominator);

/// Whether a unit has factors that fit 64 bits: those of a special scale are unknown, and larger
/// ones wrap.
bool hasExactFactors(std::uint64_t unit);

/// Not-a-number when the units differ in quantity or one cannot be converted.
double IOReportScaleValue(std::uint64_t value, std::uint64_t fromUnit, std::uint64_t toUnit);

}  // namespace tavrel
