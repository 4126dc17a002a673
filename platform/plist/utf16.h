// UTF-16 with the high byte first, as the binary encoding of property lists writes text that is not
// ASCII.
#pragma once

#include <string>
#include <string_view>

#include "base/bytes.h"

namespace tavrel::plist {

/// The text in UTF-8. A surrogate without its other half becomes U+FFFD; an odd last byte is left
/// out.
std::string utf8FromUtf16(ByteSpan words);

/// The words of a UTF-8 text; malformed bytes become U+FFFD.
std::string utf16FromUtf8(std::string_view text);

}  // namespace tavrel::plist
