// Doubles as text, without losing a bit.
//
// Reads all forms that the C library's strtod reads: decimal, hexadecimal, "inf", "nan", with a
// sign or without. A not-a-number may have its bits: "nan(0x1)" is the quiet one with payload 1,
// and a number from 2^51 up gives all bits except the sign, so that signalling ones have a text
// too.
#pragma once

#include <string>
#include <string_view>

#include "base/expected.h"

namespace tavrel {

/// The error says what is wrong with the text. A decimal number too large for a double is one.
Expected<double> parseExactDouble(std::string_view text);

/// Appends the shortest text that reads back to the same bits.
void appendExactDouble(std::string& out, double value);

}  // namespace tavrel
