#include "base/utf8.h"

namespace tavrel {
namespace {

constexpr char32_t kMalformed = 0xFFFFFFFF;

bool isSurrogate(char32_t codePoint) {
  return codePoint >= 0xD800 && codePoint <= 0xDFFF;
}

// The code point at the front of `text` and the length of its sequence; kMalformed with length 1
// for a byte that does not begin a well-formed sequence.
struct Decoded {
  char32_t codePoint;
  std::size_t length;
};

/// The length of the sequence that a lead byte of 0x80 or more begins.
std::size_t lengthAfter(unsigned char lead) {
  if (lead >= 0xF0) return 4;
  return lead >= 0xE0 ? 3 : 2;
}

Decoded decode(std::string_view text) {
  const auto lead = static_cast<unsigned char>(text.front());
  if (lead < 0x80) return {lead, 1};
  const std::size_t length = lengthAfter(lead);
  if (lead < 0xC2 || lead > 0xF4 || text.size() < length) return {kMalformed, 1};
  char32_t codePoint = lead & (0x7FU >> length);
  for (std::size_t i = 1; i < length; ++i) {
    const auto next = static_cast<unsigned char>(text[i]);
    if ((next & 0xC0) != 0x80) return {kMalformed, 1};
    codePoint = codePoint << 6 | (next & 0x3F);
  }
  static constexpr char32_t kSmallestOfLength[] = {0, 0, 0x80, 0x800, 0x10000};
  if (codePoint < kSmallestOfLength[length] || codePoint > 0x10FFFF || isSurrogate(codePoint)) {
    return {kMalformed, 1};
  }
  return {codePoint, length};
}

}  // namespace

char32_t takeCodePoint(std::string_view& text) {
  const Decoded next = decode(text);
  text.remove_prefix(next.length);
  return next.codePoint == kMalformed ? kReplacementCharacter : next.codePoint;
}

bool isValidUtf8(std::string_view text) {
  while (!text.empty()) {
    const Decoded next = decode(text);
    if (next.codePoint == kMalformed) return false;
    text.remove_prefix(next.length);
  }
  return true;
}

bool changesDirection(char32_t codePoint) {
  return codePoint == 0x061C || codePoint == 0x200E || codePoint == 0x200F ||
         (codePoint >= 0x202A && codePoint <= 0x202E) ||
         (codePoint >= 0x2066 && codePoint <= 0x2069);
}

void appendCodePoint(std::string& out, char32_t codePoint) {
  if (codePoint > 0x10FFFF || isSurrogate(codePoint)) codePoint = kReplacementCharacter;
  const auto tail = [&](unsigned shift) {
    out += static_cast<char>(0x80 | (codePoint >> shift & 0x3F));
  };
  if (codePoint < 0x80) {
    out += static_cast<char>(codePoint);
  } else if (codePoint < 0x800) {
    out += static_cast<char>(0xC0 | codePoint >> 6);
    tail(0);
  } else if (codePoint < 0x10000) {
    out += static_cast<char>(0xE0 | codePoint >> 12);
    tail(6);
    tail(0);
  } else {
    out += static_cast<char>(0xF0 | codePoint >> 18);
    tail(12);
    tail(6);
    tail(0);
  }
}

std::string repairedUtf8(std::string_view text) {
  std::string repaired;
  repaired.reserve(text.size());
  while (!text.empty())
    appendCodePoint(repaired, takeCodePoint(text));
  return repaired;
}

}  // namespace tavrel
