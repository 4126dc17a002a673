#include "page/number_text.h"

#include <algorithm>
#include <cmath>
#include <iterator>

#include "base/format.h"
#include "base/quantity_text.h"
#include "base/text.h"

namespace tavrel::page {
namespace {

// Both are non-breaking.
constexpr char kNarrowBlank[] = "\u202F";
constexpr char kBlank[] = "\u00A0";

// Groups the digits before the point; leaves a number with an exponent unchanged.
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

// A unit as named in catalogue/, and its size in a base unit that takes prefixes.
struct ScaledUnit {
  std::string_view name;
  double factor;
  std::string_view base;
};

constexpr std::string_view kSize = "B", kTime = "s";

constexpr ScaledUnit kScaledUnits[] = {{"bytes", 1, kSize},
                                       {"KiB", 0x1p10, kSize},
                                       {"MiB", 0x1p20, kSize},
                                       {"nanoseconds", 1e-9, kTime},
                                       {"microseconds", 1e-6, kTime},
                                       {"milliseconds", 1e-3, kTime},
                                       {"seconds", 1, kTime},
                                       {"minutes", 60, kTime},
                                       {"hours", 3600, kTime},
                                       {"degrees Celsius", 1, "°C"},
                                       {"thousandths of a degree Celsius", 1e-3, "°C"},
                                       {"millivolts", 1e-3, "V"},
                                       {"microvolts", 1e-6, "V"},
                                       {"milliamperes", 1e-3, "A"},
                                       {"microamperes", 1e-6, "A"},
                                       {"microwatts", 1e-6, "W"},
                                       {"microjoules", 1e-6, "J"}};

// Units that are not shown next to a figure.
constexpr std::string_view kPlainUnits[] = {"", "count", "number", "state", "mask"};

std::string timeText(double seconds) {
  constexpr double kMinute = 60, kHour = 3600, kDay = 86'400;
  const double size = std::abs(seconds);
  if (size < 2 * kMinute) return quantityText(seconds, "s");
  if (size < 2 * kHour) return format("%s min", shortNumber(std::round(seconds / kMinute)));
  const bool isHours = size < 2 * kDay;
  const double value = std::round(10 * seconds / (isHours ? kHour : kDay)) / 10;
  return format("%s %s", shortNumber(value), isHours ? "h" : "days");
}

std::string withUnit(const std::string& number, std::string_view unit) {
  if (std::ranges::find(kPlainUnits, unit) != std::end(kPlainUnits)) return number;
  if (unit == "percent") return number + kBlank + "%";
  return number + " " + std::string(unit);
}

}  // namespace

std::string shortNumber(double value) {
  if (!std::isfinite(value) || value == std::trunc(value)) return exactNumber(value);
  const double magnitude = std::floor(std::log10(std::abs(value)));
  if (magnitude >= 3) return grouped(tavrel::numberText(std::round(value)));
  const double scale = std::pow(10, 3 - magnitude);
  const double rounded = std::round(value * scale) / scale;
  return grouped(tavrel::numberText(std::isfinite(rounded) ? rounded : value));
}

std::string shortNumber(std::int64_t value) {
  return grouped(std::to_string(value));
}

std::string exactNumber(double value) {
  return grouped(tavrel::numberText(value));
}

std::string figureText(double value, std::string_view unit) {
  for (const ScaledUnit& scaled : kScaledUnits) {
    if (scaled.name != unit) continue;
    if (scaled.base == kSize) return sizeText(value * scaled.factor);
    if (scaled.base == kTime) return timeText(value * scaled.factor);
    return quantityText(value * scaled.factor, scaled.base);
  }
  return withUnit(shortNumber(value), unit);
}

std::string figureText(std::int64_t value, std::string_view unit) {
  if (std::ranges::find(kScaledUnits, unit, &ScaledUnit::name) != std::end(kScaledUnits))
    return figureText(static_cast<double>(value), unit);
  return withUnit(shortNumber(value), unit);
}

std::string exactFigure(double value, std::string_view unit) {
  return withUnit(exactNumber(value), unit);
}

}  // namespace tavrel::page
