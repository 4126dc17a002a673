// UTF-8: validation, and reading text code point by code point.
#pragma once

#include <string>
#include <string_view>

namespace tavrel {

inline constexpr char32_t kReplacementCharacter = 0xFFFD;

/// Takes the next code point off the front of `text`, which must not be empty. A byte that does not
/// begin a well-formed sequence is taken alone and yields the replacement character.
char32_t takeCodePoint(std::string_view& text);

/// True when `text` is well-formed UTF-8 (shortest forms, no surrogates).
bool isValidUtf8(std::string_view text);

/// True for invisible characters that change the direction of surrounding text, with which one name
/// could look like another.
bool changesDirection(char32_t codePoint);

constexpr bool isPrintableAscii(char character) {
  return character >= ' ' && character <= '~';
}

/// Appends a code point; surrogates and numbers beyond U+10FFFF become the replacement character.
void appendCodePoint(std::string& out, char32_t codePoint);

/// `text` with the replacement character for each malformed byte.
std::string repairedUtf8(std::string_view text);

}  // namespace tavrel
