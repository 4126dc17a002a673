// Unchecked copies of little-endian numbers, for readers that have found their bytes complete.
#pragma once

#include <algorithm>
#include <bit>
#include <cstddef>
#include <cstring>

namespace tavrel {

/// Copies a number from little-endian bytes to memory in this machine's order, or back.
inline void copyLittle(void* to, const void* from, std::size_t size) {
  if constexpr (std::endian::native == std::endian::little) {
    std::memcpy(to, from, size);
  } else {
    const auto* const bytes = static_cast<const std::byte*>(from);
    std::reverse_copy(bytes, bytes + size, static_cast<std::byte*>(to));
  }
}

}  // namespace tavrel
