// Numbers as the XML encoding of property lists writes them.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "base/plist.h"

namespace tavrel::plist {

/// Integers in decimal; reals in the shortest text that reads back to the same double.
void appendNumber(std::string& out, const Number& number);

/// Decimal digits or, after "0x", hexadecimal ones, with an optional sign, from the least signed to
/// the largest unsigned 64-bit integer; nothing for any other text.
std::optional<Number> parseInteger(std::string_view text);

/// A decimal number, "nan", "inf" or "infinity" in either case, with an optional sign; nothing for
/// any other text and for a number beyond the range of a double.
std::optional<double> parseReal(std::string_view text);

}  // namespace tavrel::plist
