// Numbers as people read them.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace tavrel::page {

/// Whole numbers in full and others with four significant digits; narrow blanks separate groups of
/// three digits: "12 345 678", "0.08324", "1.2e+30".
std::string shortNumber(double value);
std::string shortNumber(std::int64_t value);

/// All digits of a number, in groups: for labels that must differ when their numbers do.
std::string exactNumber(double value);

/// A number with its unit, as named in catalogue/. Sizes, times and electrical units get prefixes:
/// "1.5 GiB", "12.5 ms", "3.2 days", "41.3 °C". Percentages are "12 %", counts have no unit, and
/// any other unit follows the number.
std::string figureText(double value, std::string_view unit);
std::string figureText(std::int64_t value, std::string_view unit);

/// All digits of a number, with its unit unchanged: "204 900 MiB".
std::string exactFigure(double value, std::string_view unit);

}  // namespace tavrel::page
