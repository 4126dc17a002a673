#include "base/uuid.h"

namespace tavrel {
namespace {

constexpr std::size_t kCharacters = 36;
constexpr std::string_view kDigits = "0123456789ABCDEF";

constexpr bool isGroupEnd(std::size_t character) {
  return character == 8 || character == 13 || character == 18 || character == 23;
}

constexpr char upper(char c) {
  return c >= 'a' && c <= 'f' ? static_cast<char>(c - 'a' + 'A') : c;
}

}  // namespace

std::string uuidText(const UuidBytes& bytes) {
  std::string text;
  text.reserve(kCharacters);
  for (const std::byte byte : bytes) {
    if (isGroupEnd(text.size())) text += '-';
    text += kDigits[std::to_integer<unsigned>(byte) >> 4];
    text += kDigits[std::to_integer<unsigned>(byte) & 0xF];
  }
  return text;
}

std::optional<std::string> normalisedUuid(std::string_view text) {
  if (text.size() != kCharacters) return std::nullopt;
  std::string normalised;
  normalised.reserve(kCharacters);
  for (const char c : text) {
    const bool fits =
        isGroupEnd(normalised.size()) ? c == '-' : kDigits.find(upper(c)) != kDigits.npos;
    if (!fits) return std::nullopt;
    normalised += upper(c);
  }
  return normalised;
}

}  // namespace tavrel
