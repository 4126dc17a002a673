#include "base/uuid.h"

#include "base/ascii.h"

namespace tavrel {
namespace {

constexpr std::size_t kCharacters = 36;

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
    appendHexByte(text, std::to_integer<char>(byte));
  }
  return text;
}

std::optional<std::string> normalisedUuid(std::string_view text) {
  if (text.size() != kCharacters) return std::nullopt;
  std::string normalised;
  normalised.reserve(kCharacters);
  for (const char c : text) {
    const bool fits = isGroupEnd(normalised.size()) ? c == '-' : hexDigit(c).has_value();
    if (!fits) return std::nullopt;
    normalised += upper(c);
  }
  return normalised;
}

}  // namespace tavrel
