// Text in the form that an encoding, or an error message, can hold.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace tavrel::plist {

enum class Alphabet : std::uint8_t {
  Unicode,  // every well-formed text
  Xml       // without the control characters and U+FFFE, U+FFFF that XML 1.0 forbids
};

/// True when the text is well-formed and the alphabet has all its characters.
bool isEncodable(std::string_view text, Alphabet alphabet);

/// The text with U+FFFD for each malformed byte and each character that the alphabet lacks.
std::string encodable(std::string_view text, Alphabet alphabet);

/// Appends the text as `encodable` with the alphabet Xml, and escapes markup characters. A carriage
/// return is escaped too: parsers turn a plain one into a line feed.
void appendXmlText(std::string& out, std::string_view text);

/// The start of a text for a message: on one line, escaped as JSON does, and cut after 60 bytes
/// with "...".
std::string excerpt(std::string_view text);

}  // namespace tavrel::plist
