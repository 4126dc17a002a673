// Numbers as people read them.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace tavrel::page {

/// Whole numbers in full and others with four significant digits; digits in groups of three with
/// narrow blanks: "12 345 678", "0.08324", "1.2e+30".
std::string shortNumber(double value);
std::string shortNumber(std::int64_t value);

/// The same with its unit, as catalogue/ names units. Sizes, times and electrical units get
/// prefixes: "1.5 GiB", "12.5 ms", "3.2 days", "41.3 °C". Percentages are "12 %", counts have no
/// unit, and other units stand behind the number.
std::string figureText(double value, std::string_view unit);

}  // namespace tavrel::page
