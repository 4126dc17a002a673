#include "page/number_text.h"

#include <cmath>

#include "base/format.h"
#include "base/quantity_text.h"
#include "base/text.h"

namespace tavrel::page {
namespace {

constexpr std::string_view kNarrowBlank = "\u202F";

// Groups the digits before the point; a number with an exponent stays as it is.
std::string grouped(std::string_view digits) {
  std::string text;
  if (digits.starts_with('-')) {
    text = "\u2212";
    digits.remove_prefix(1);
  }
  const std::size_t whole = std::min(digits.find_first_not_of("0123456789"), digits.size());
  if (whole < 5) return text.append(digits);
  for (std::size_t i = 0; i < whole; ++i) {
    if (i > 0 && (whole - i) % 3 == 0) text += kNarrowBlank;
    text += digits[i];
  }
  return text.append(digits.substr(whole));
}

// How a unit is written in data, what one of it is in a unit that takes prefixes, and that unit.
struct ScaledUnit {
  std::string_view name;
  double factor;
  std::string_view base;  // "B": of sizes
};

constexpr ScaledUnit kScaledUnits[] = {
    {"B", 1, "B"},        {"bytes", 1, "B"}, {"KiB", 0x1p10, "B"}, {"MiB", 0x1p20, "B"},
    {"GiB", 0x1p30, "B"}, {"ns", 1e-9, "s"}, {"µs", 1e-6, "s"},    {"us", 1e-6, "s"},
    {"ms", 1e-3, "s"},    {"s", 1, "s"},     {"W", 1, "W"},        {"mW", 1e-3, "W"},
    {"µW", 1e-6, "W"},    {"J", 1, "J"},     {"mJ", 1e-3, "J"},    {"µJ", 1e-6, "J"},
    {"A", 1, "A"},        {"mA", 1e-3, "A"}, {"µA", 1e-6, "A"},    {"V", 1, "V"},
    {"mV", 1e-3, "V"},    {"µV", 1e-6, "V"}, {"Hz", 1, "Hz"},      {"kHz", 1e3, "Hz"},
    {"MHz", 1e6, "Hz"},   {"°C", 1, "°C"},   {"m°C", 1e-3, "°C"}};

std::string timeText(double seconds) {
  constexpr double kMinute = 60, kHour = 3600, kDay = 86'400;
  const double size = std::abs(seconds);
  if (size < 2 * kMinute) return quantityText(seconds, "s");
  if (size < 2 * kHour) return format("%s min", shortNumber(std::round(seconds / kMinute)));
  const bool isHours = size < 2 * kDay;
  const double value = std::round(10 * seconds / (isHours ? kHour : kDay)) / 10;
  return format("%s %s", shortNumber(value), isHours ? "h" : "days");
}

}  // namespace

std::string shortNumber(double value) {
  if (!std::isfinite(value) || value == std::trunc(value))
    return grouped(tavrel::numberText(value));
  const double magnitude = std::floor(std::log10(std::abs(value)));
  if (magnitude >= 3) return grouped(tavrel::numberText(std::round(value)));
  const double scale = std::pow(10, 3 - magnitude);
  const double rounded = std::round(value * scale) / scale;
  return grouped(tavrel::numberText(std::isfinite(rounded) ? rounded : value));
}

std::string shortNumber(std::int64_t value) {
  return grouped(std::to_string(value));
}

std::string figureText(double value, std::string_view unit) {
  if (unit.empty()) return shortNumber(value);
  for (const ScaledUnit& scaled : kScaledUnits) {
    if (scaled.name != unit) continue;
    if (scaled.base == "B") return sizeText(value * scaled.factor);
    if (scaled.base == "s") return timeText(value * scaled.factor);
    return quantityText(value * scaled.factor, scaled.base);
  }
  return shortNumber(value) + (unit == "%" ? "\u00A0" : " ") + std::string(unit);
}

}  // namespace tavrel::page
