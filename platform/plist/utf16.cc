#include "platform/plist/utf16.h"

#include "base/utf8.h"

namespace tavrel::plist {
namespace {

constexpr char32_t kFirstHigh = 0xD800;
constexpr char32_t kFirstLow = 0xDC00;
constexpr char32_t kEndOfLow = 0xE000;
constexpr char32_t kFirstPaired = 0x10000;

char32_t wordAt(ByteSpan words, std::size_t offset) {
  return std::to_integer<char32_t>(words[offset]) << 8 |
         std::to_integer<char32_t>(words[offset + 1]);
}

void appendWord(std::string& out, char32_t word) {
  out += static_cast<char>(word >> 8 & 0xFF);
  out += static_cast<char>(word & 0xFF);
}

}  // namespace

std::string utf8FromUtf16(ByteSpan words) {
  std::string text;
  text.reserve(words.size());
  for (std::size_t i = 0; i + 1 < words.size(); i += 2) {
    char32_t codePoint = wordAt(words, i);
    if (codePoint >= kFirstHigh && codePoint < kFirstLow && i + 3 < words.size()) {
      const char32_t low = wordAt(words, i + 2);
      if (low >= kFirstLow && low < kEndOfLow) {
        codePoint = kFirstPaired + ((codePoint - kFirstHigh) << 10) + (low - kFirstLow);
        i += 2;
      }
    }
    appendCodePoint(text, codePoint);
  }
  return text;
}

std::string utf16FromUtf8(std::string_view text) {
  std::string words;
  words.reserve(text.size() * 2);
  while (!text.empty()) {
    const char32_t codePoint = takeCodePoint(text);
    if (codePoint < kFirstPaired) {
      appendWord(words, codePoint);
    } else {
      appendWord(words, kFirstHigh + ((codePoint - kFirstPaired) >> 10));
      appendWord(words, kFirstLow + ((codePoint - kFirstPaired) & 0x3FF));
    }
  }
  return words;
}

}  // namespace tavrel::plist
