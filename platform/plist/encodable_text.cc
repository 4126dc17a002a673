#include "platform/plist/encodable_text.h"

#include <array>

#include "base/text.h"
#include "base/utf8.h"

namespace tavrel::plist {
namespace {

bool isXmlCharacter(char32_t codePoint) {
  if (codePoint < 0x20) return codePoint == '\t' || codePoint == '\n' || codePoint == '\r';
  return codePoint != 0xFFFE && codePoint != 0xFFFF;
}

// True for the bytes that need no escape in XML text.
constexpr std::array<bool, 256> kPlain = [] {
  std::array<bool, 256> plain{};
  for (std::size_t byte = 0x20; byte < 0x80; ++byte)
    plain[byte] = byte != '&' && byte != '<' && byte != '>';
  plain['\t'] = plain['\n'] = true;
  return plain;
}();

std::size_t plainLength(std::string_view text) {
  std::size_t length = 0;
  while (length < text.size() && kPlain[static_cast<unsigned char>(text[length])])
    ++length;
  return length;
}

}  // namespace

bool isEncodable(std::string_view text, Alphabet alphabet) {
  while (true) {
    text.remove_prefix(plainLength(text));
    if (text.empty()) return true;
    const std::string_view before = text;
    const char32_t codePoint = takeCodePoint(text);
    if (alphabet == Alphabet::Xml && !isXmlCharacter(codePoint)) return false;
    // A replacement character that is part of the text takes three bytes; one takes only one byte
    // when it stands for a malformed byte.
    if (codePoint == kReplacementCharacter && before.size() - text.size() == 1) return false;
  }
}

std::string encodable(std::string_view text, Alphabet alphabet) {
  std::string out;
  out.reserve(text.size());
  while (!text.empty()) {
    const char32_t codePoint = takeCodePoint(text);
    const bool lacking = alphabet == Alphabet::Xml && !isXmlCharacter(codePoint);
    appendCodePoint(out, lacking ? kReplacementCharacter : codePoint);
  }
  return out;
}

void appendXmlText(std::string& out, std::string_view text) {
  while (true) {
    const std::size_t plain = plainLength(text);
    out.append(text, 0, plain);
    text.remove_prefix(plain);
    if (text.empty()) return;
    switch (const char32_t codePoint = takeCodePoint(text)) {
      case '&':
        out += "&amp;";
        break;
      case '<':
        out += "&lt;";
        break;
      case '>':
        out += "&gt;";
        break;
      case '\r':
        out += "&#13;";
        break;
      default:
        appendCodePoint(out, isXmlCharacter(codePoint) ? codePoint : kReplacementCharacter);
    }
  }
}

std::string excerpt(std::string_view text) {
  constexpr std::size_t kLongest = 60;
  std::size_t length = text.size();
  if (length > kLongest) {
    length = kLongest;
    while (length > 0 && (text[length] & 0xC0) == 0x80)
      --length;
  }
  std::string quoted;
  appendQuoted(quoted, text.substr(0, length));
  return quoted.substr(1, quoted.size() - 2) + (length < text.size() ? "..." : "");
}

}  // namespace tavrel::plist
