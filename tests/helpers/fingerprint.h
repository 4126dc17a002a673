// FNV-1a, to check texts that are too long to include in a test.
#pragma once

#include <cstdint>
#include <string_view>

namespace tavrel {

inline std::uint64_t fingerprint(std::string_view text) {
  std::uint64_t hash = 0xCBF29CE484222325;
  for (const char c : text)
    hash = (hash ^ static_cast<unsigned char>(c)) * 0x100000001B3;
  return hash;
}

}  // namespace tavrel
