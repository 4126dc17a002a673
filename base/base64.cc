#include "base/base64.h"

#include <array>
#include <cstdint>

namespace tavrel {
namespace {

constexpr std::string_view kDigits =
    "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

// Digits have values of six bits; the other kinds of characters have higher bits.
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

std::byte* putGroup(std::uint32_t group, std::byte* end) {
  for (const unsigned shift : {16U, 8U, 0U})
    *end++ = static_cast<std::byte>(group >> shift);
  return end;
}

// Takes whole groups of four digits from the front of the text.
std::byte* takeGroups(std::string_view& text, std::byte* end) {
  std::string_view rest = text;  // a copy: the bytes written cannot alias it
  while (rest.size() >= 4) {
    const auto value = [rest](std::size_t i) -> std::uint32_t {
      return kValues[static_cast<unsigned char>(rest[i])];
    };
    if (((value(0) | value(1) | value(2) | value(3)) & ~0x3FU) != 0) break;
    end = putGroup(value(0) << 18 | value(1) << 12 | value(2) << 6 | value(3), end);
    rest.remove_prefix(4);
  }
  text = rest;
  return end;
}

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
  out.resize(text.size() / 4 * 3 + 3);
  std::byte* end = out.data();
  std::uint32_t group = 0;
  unsigned digits = 0;   // of the group
  unsigned padding = 0;  // characters at the end
  while (!text.empty()) {
    if (digits == 0 && padding == 0) end = takeGroups(text, end);
    if (text.empty()) break;
    const std::uint8_t value = kValues[static_cast<unsigned char>(text.front())];
    text.remove_prefix(1);
    if (value == kSpace) continue;
    if (value == kPadding) {
      ++padding;
      continue;
    }
    if (value == kForeign || padding != 0) return false;
    group = group << 6 | value;
    if (++digits < 4) continue;
    end = putGroup(group, end);
    digits = 0;
    group = 0;
  }
  if (digits != 0) {
    if (digits == 1 || digits + padding != 4) return false;
    putGroup(group << 6 * padding, end);
    end += digits - 1;
  } else if (padding != 0) {
    return false;
  }
  out.resize(static_cast<std::size_t>(end - out.data()));
  return true;
}

}  // namespace tavrel
