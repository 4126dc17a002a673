// Figures with a unit as people read them. JSON has them exactly.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace tavrel {

/// "512 bytes", "1.5 KiB", with binary prefixes up to EiB.
std::string sizeText(double bytes);

/// Three significant digits behind a prefix from pico to tera: "12.5 ms", "2.4 GHz". Seconds have
/// no prefix above one, degrees ("°C") none at all.
std::string quantityText(double value, std::string_view unit);

/// "9.1 %", of a share such as 0.0908.
std::string percentText(double share);

}  // namespace tavrel
