#include "tools/report/report_quantity.h"

#include "base/quantity_text.h"
#include "ioreport/ioreport.h"

namespace tavrel {
namespace {

struct PlainUnit {
  std::uint64_t unit;
  std::string_view name;
};

constexpr std::uint64_t quantity(std::uint64_t number) {
  return number << 56;
}

constexpr std::string_view kBytes = "bytes";

constexpr PlainUnit kPlainUnits[] = {
    {kUnitSeconds, "s"},
    {quantity(2), "W"},
    {quantity(3), "J"},
    {quantity(4), "A"},
    {quantity(5), "V"},
    {quantity(6), "F"},
    {quantity(7), "H"},
    {quantity(8), "Hz"},
    {quantity(9) | std::uint64_t{0x008200} << 32, kBytes},  // units of 2^3 bits
    {quantity(10), "°C"},
};

}  // namespace

std::optional<ConvertedValue> convertedValue(const plist::Dictionary& channel, std::int64_t value) {
  const std::int64_t unit = IOReportChannelGetUnit(channel);
  if (value == kInvalidValue || unit == kInvalidValue) return std::nullopt;
  const auto word = static_cast<std::uint64_t>(unit);
  if (!hasExactFactors(word)) return std::nullopt;
  const auto magnitude =
      value < 0 ? 0 - static_cast<std::uint64_t>(value) : static_cast<std::uint64_t>(value);
  for (const PlainUnit& plain : kPlainUnits) {
    if (word >> 56 != plain.unit >> 56) continue;
    const double converted = IOReportScaleValue(magnitude, word, plain.unit);
    return ConvertedValue{value < 0 ? -converted : converted, plain.name};
  }
  return std::nullopt;
}

std::uint64_t residencyToShare(const Elements& states, bool isDelta) {
  for (std::size_t i = 0; isDelta && i < states.count(); ++i)
    if (states.value(i, kStateResidency) < 0) return 0;
  return totalResidency(states);
}

std::string textOf(const ConvertedValue& converted) {
  return converted.unit == kBytes ? sizeText(converted.value)
                                  : quantityText(converted.value, converted.unit);
}

}  // namespace tavrel
