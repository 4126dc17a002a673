// The layout of the binary encoding, shared by reader and writer.
//
//   header   "bplist00"
//   objects  each a marker byte, whose high four bits are the type, and its content
//   table    the offset of each object, in words of `offsetWidth` bytes
//   trailer  32 bytes
//
// The low four bits of a marker are a length: for numbers the binary logarithm of their size in
// bytes; for texts, data and containers the number of their elements, or 15 when an integer object
// with that number follows. A container holds references, which are object numbers of
// `referenceWidth` bytes: an array those of its elements, a dictionary those of its keys and then
// those of its values.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

namespace tavrel::plist::binary {

inline constexpr std::string_view kHeader = "bplist00";

enum Marker : std::uint8_t {
  kNull = 0x00,
  kFalse = 0x08,
  kTrue = 0x09,
  kInteger = 0x10,  // 1, 2 or 4 bytes unsigned, 8 or 16 signed
  kReal = 0x20,     // 4 or 8 bytes
  kDate = 0x33,     // a double: seconds since 2001-01-01 00:00:00 UTC
  kData = 0x40,
  kAscii = 0x50,
  kUtf16 = 0x60,  // the length counts words of 2 bytes
  kArray = 0xA0,
  kDictionary = 0xD0,
};

inline constexpr std::uint8_t kTypeMask = 0xF0;
inline constexpr std::uint8_t kLengthMask = 0x0F;
inline constexpr std::uint8_t kLengthFollows = 0x0F;

// Offsets in the trailer; the first six bytes are not used here.
inline constexpr std::size_t kOffsetWidthAt = 6;
inline constexpr std::size_t kReferenceWidthAt = 7;
inline constexpr std::size_t kObjectCountAt = 8;
inline constexpr std::size_t kRootAt = 16;
inline constexpr std::size_t kTableOffsetAt = 24;
inline constexpr std::size_t kTrailerBytes = 32;

}  // namespace tavrel::plist::binary
