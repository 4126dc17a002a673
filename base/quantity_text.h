// Figures with a unit, rounded, as text for people; JSON output has exact figures.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace tavrel {

/// "512 bytes", "1.5 KiB", with binary prefixes up to EiB.
std::string sizeText(double bytes);

/// Rounded to three significant digits, with a prefix from pico to tera: "12.5 ms", "2.4 GHz".
/// Seconds have no prefix for values above one, degrees ("°C") none at all; such numbers beyond
/// 1,000 are rounded to whole ones.
std::string quantityText(double value, std::string_view unit);

/// "9.1 %" for a share of 0.0908.
std::string percentText(double share);

/// "90 s", "15 min", "30 h", "12 days".
std::string ageText(std::int64_t seconds);

}  // namespace tavrel
