#include "tools/shared/base64.h"

#include <cstdint>

namespace tavrel {
namespace {

constexpr std::string_view kAlphabet =
    "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

}  // namespace

std::string base64Text(ByteSpan bytes) {
  std::string out;
  out.reserve((bytes.size() + 2) / 3 * 4);
  for (std::size_t at = 0; at < bytes.size(); at += 3) {
    const std::size_t count = std::min<std::size_t>(bytes.size() - at, 3);
    std::uint32_t word = 0;
    for (std::size_t i = 0; i < 3; ++i) {
      word = word << 8 | (i < count ? std::to_integer<std::uint32_t>(bytes[at + i]) : 0U);
    }
    for (std::size_t i = 0; i < 4; ++i) {
      out += i <= count ? kAlphabet[word >> (18 - 6 * i) & 63U] : '=';
    }
  }
  return out;
}

std::optional<std::vector<std::byte>> parseBase64(std::string_view text) {
  std::vector<std::byte> bytes;
  bytes.reserve(text.size() / 4 * 3);
  std::uint32_t word = 0;
  unsigned digits = 0;  // of the current group of four
  unsigned padding = 0;
  for (const char character : text) {
    if (character == ' ' || character == '\n' || character == '\r' || character == '\t') continue;
    if (character == '=') {
      if (digits + ++padding > 4 || digits < 2) return std::nullopt;
      continue;
    }
    const std::size_t digit = kAlphabet.find(character);
    if (digit == std::string_view::npos || padding > 0) return std::nullopt;
    word = word << 6 | static_cast<std::uint32_t>(digit);
    if (++digits < 4) continue;
    for (const unsigned shift : {16U, 8U, 0U})
      bytes.push_back(static_cast<std::byte>(word >> shift));
    word = 0;
    digits = 0;
  }
  if (digits == 0) return padding == 0 ? std::optional(std::move(bytes)) : std::nullopt;
  if (digits + padding != 4) return std::nullopt;
  word <<= 6 * padding;
  for (unsigned i = 0; i + 1 < digits; ++i) {
    bytes.push_back(static_cast<std::byte>(word >> (16 - 8 * i)));
  }
  return bytes;
}

}  // namespace tavrel
