// Reads hexadecimal digits as numbers, leniently: a character that is not a digit counts as 0 and
// is reported on standard output.
#pragma once

#include <cstdint>
#include <string_view>

#include "platform/standard_streams.h"

namespace tavrel {

/// Reads at most 2 characters.
std::uint8_t hexStringToByte(StandardStreams& streams, std::string_view text);

/// Reads at most 8 characters, byte by byte from the left: an odd last character is a byte of its
/// own, so "abc" is 0xAB0C.
std::uint32_t hexStringToInt32(StandardStreams& streams, std::string_view text);

}  // namespace tavrel
