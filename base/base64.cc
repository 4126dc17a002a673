#include "base/base64.h"

#include <array>
#include <cstdint>

namespace tavrel {
namespace {

constexpr std::string_view kDigits =
    "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

// A value with a bit above the six is not a digit.
constexpr std::uint8_t kSpace = 0x40;
constexpr std::uint8_t kPadding = 0x80;
constexpr std::uint8_t kForeign = 0xC0;

constexpr std::array<std::uint8_t, 256> kValues = [] {
  std::array<std::uint8_t, 256> values{};
  values.fill(kForeign);
  for (std::size_t i = 0; i < kDigits.size(); ++i)
    values[static_cast<unsigned char>(kDigits[i])] = static_cast<std::uint8_t>(i);
  for (const char space : {' ', '\t', '\n', '\r'})
    values[static_cast<unsigned char>(space)] = kSpace;
  values['='] = kPadding;
  return values;
}();

}  // namespace

void appendBase64(std::string& out, ByteSpan bytes) {
  const auto digit = [](std::uint32_t group, unsigned shift) {
    return kDigits[group >> shift & 0x3F];
  };
  while (!bytes.empty()) {
    const std::size_t length = bytes.size() < 3 ? bytes.size() : 3;
    std::uint32_t group = 0;
    for (std::size_t i = 0; i < 3; ++i)
      group = group << 8 | (i < length ? std::to_integer<std::uint32_t>(bytes[i]) : 0);
    const char text[] = {digit(group, 18), digit(group, 12), length > 1 ? digit(group, 6) : '=',
                         length > 2 ? digit(group, 0) : '='};
    out.append(text, sizeof text);
    bytes = bytes.subspan(length);
  }
}

bool readBase64(std::string_view text, std::vector<std::byte>& out) {
  out.clear();
  out.reserve(text.size() / 4 * 3 + 3);
  std::uint32_t group = 0;
  unsigned digits = 0;   // of the group
  unsigned padding = 0;  // characters at the end
  for (const char character : text) {
    const std::uint8_t value = kValues[static_cast<unsigned char>(character)];
    if (value == kSpace) continue;
    if (value == kPadding) {
      ++padding;
      continue;
    }
    if (value == kForeign || padding != 0) return false;
    group = group << 6 | value;
    if (++digits < 4) continue;
    for (const unsigned shift : {16U, 8U, 0U})
      out.push_back(static_cast<std::byte>(group >> shift));
    digits = 0;
    group = 0;
  }
  if (digits == 0) return padding == 0;
  if (digits == 1 || digits + padding != 4) return false;
  group <<= 6 * padding;
  out.push_back(static_cast<std::byte>(group >> 16));
  if (padding == 1) out.push_back(static_cast<std::byte>(group >> 8));
  return true;
}

}  // namespace tavrel
