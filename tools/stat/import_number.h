// Doubles as text, with every bit preserved.
//
// Reads all forms that strtod of the C library reads: decimal, hexadecimal, "inf" and "nan",
// with or without a sign. A not-a-number may state its bits: "nan(0x1)" is the quiet one with
// payload 1, and a number of 2^51 or more gives all bits except the sign, so that signalling
// ones can be written, too.
#pragma once

#include <string>
#include <string_view>

#include "base/expected.h"

namespace tavrel {

/// The error says what is wrong with the text. A decimal number too large for a double is an error.
Expected<double> parseExactDouble(std::string_view text);

/// Appends the shortest text that reads back to the same bits.
void appendExactDouble(std::string& out, double value);

}  // namespace tavrel
