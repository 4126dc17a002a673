#include "base/quantity_text.h"

#include <algorithm>
#include <cmath>

#include "base/format.h"
#include "base/text.h"

namespace tavrel {
namespace {

constexpr std::string_view kPrefixes[] = {"p", "n", "µ", "m", "", "k", "M", "G", "T"};
constexpr int kNoPrefix = 4;
constexpr int kLargestPrefix = 8;

// Halves round away from zero: 41.25 gives 41.3.
std::string significant(double value) {
  if (value == 0 || !std::isfinite(value)) return numberText(value);
  const double digits = std::max(0.0, 2 - std::floor(std::log10(std::abs(value))));
  const double scale = std::pow(10.0, digits);
  return numberText(std::round(value * scale) / scale);
}

}  // namespace

std::string sizeText(double bytes) {
  constexpr std::string_view kUnits[] = {"bytes", "KiB", "MiB", "GiB", "TiB", "PiB", "EiB"};
  if (bytes == 1) return "1 byte";
  std::size_t unit = 0;
  // A value that would round to 1024.0 is shown in the next unit.
  for (double next = 1024; std::abs(bytes) >= next && unit + 1 < std::size(kUnits); ++unit) {
    bytes /= 1024;
    next = 1023.95;
  }
  return format("%.*f %s", unit == 0 ? 0 : 1, bytes, kUnits[unit]);
}

std::string quantityText(double value, std::string_view unit) {
  int prefix = kNoPrefix;
  if (unit != "°C" && std::isfinite(value) && value != 0) {
    const int largest = unit == "s" ? kNoPrefix : kLargestPrefix;
    // A value that would round to 1000 is shown with the next prefix.
    for (; std::abs(value) < 0.9995 && prefix > 0; --prefix)
      value *= 1000;
    for (; std::abs(value) >= 999.5 && prefix < largest; ++prefix)
      value /= 1000;
  }
  return format("%s %s%s", significant(value), kPrefixes[prefix], unit);
}

std::string percentText(double share) {
  return format("%.1f %%", 100 * share);
}

std::string ageText(std::int64_t seconds) {
  if (seconds < 120) return format("%lld s", seconds);
  if (seconds < 7200) return format("%lld min", seconds / 60);
  return seconds < 172'800 ? format("%lld h", seconds / 3600)
                           : format("%lld days", seconds / 86'400);
}

}  // namespace tavrel
