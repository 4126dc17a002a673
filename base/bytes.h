// Bounds-checked access to byte buffers from outside.
//
// A load takes the buffer and an offset, and returns nothing when the value is not wholly inside.
// Offsets are 64-bit, so that no sum of 32-bit fields can wrap before it is checked.
#pragma once

#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <optional>
#include <span>
#include <string_view>
#include <type_traits>

namespace tavrel {

using ByteSpan = std::span<const std::byte>;
using MutableByteSpan = std::span<std::byte>;

/// The `length` bytes of `bytes` from `offset` on, or nothing when `bytes` ends before.
constexpr std::optional<ByteSpan> slice(ByteSpan bytes, std::uint64_t offset,
                                        std::uint64_t length) {
  if (offset > bytes.size() || length > bytes.size() - offset) return std::nullopt;
  return bytes.subspan(static_cast<std::size_t>(offset), static_cast<std::size_t>(length));
}

namespace bytes_detail {

template <class Word>
constexpr Word assembleLittle(const std::byte* at) {
  // Compilers do not turn the loop into one load.
  if (!std::is_constant_evaluated() && std::endian::native == std::endian::little) {
    Word whole;
    std::memcpy(&whole, at, sizeof whole);
    return whole;
  }
  std::uint64_t word = 0;
  for (std::size_t i = 0; i < sizeof(Word); ++i) {
    word |= std::to_integer<std::uint64_t>(at[i]) << (8 * i);
  }
  return static_cast<Word>(word);
}

template <class Word>
constexpr std::optional<Word> loadLittle(ByteSpan bytes, std::uint64_t offset) {
  const auto part = slice(bytes, offset, sizeof(Word));
  if (!part) return std::nullopt;
  return assembleLittle<Word>(part->data());
}

template <class Word>
std::optional<Word> loadNative(ByteSpan bytes, std::uint64_t offset) {
  const auto part = slice(bytes, offset, sizeof(Word));
  if (!part) return std::nullopt;
  Word word;
  std::memcpy(&word, part->data(), sizeof word);
  return word;
}

template <class Word>
constexpr bool storeLittle(MutableByteSpan bytes, std::uint64_t offset, Word word) {
  if (!slice(bytes, offset, sizeof(Word))) return false;
  if (!std::is_constant_evaluated() && std::endian::native == std::endian::little) {
    std::memcpy(&bytes[static_cast<std::size_t>(offset)], &word, sizeof word);
    return true;
  }
  for (std::size_t i = 0; i < sizeof(Word); ++i) {
    bytes[static_cast<std::size_t>(offset) + i] =
        static_cast<std::byte>(static_cast<std::uint64_t>(word) >> (8 * i));
  }
  return true;
}

}  // namespace bytes_detail

constexpr std::optional<std::uint8_t> loadByte(ByteSpan bytes, std::uint64_t offset) {
  return bytes_detail::loadLittle<std::uint8_t>(bytes, offset);
}
constexpr std::optional<std::uint16_t> loadLittle16(ByteSpan bytes, std::uint64_t offset) {
  return bytes_detail::loadLittle<std::uint16_t>(bytes, offset);
}
constexpr std::optional<std::uint32_t> loadLittle32(ByteSpan bytes, std::uint64_t offset) {
  return bytes_detail::loadLittle<std::uint32_t>(bytes, offset);
}
constexpr std::optional<std::uint64_t> loadLittle64(ByteSpan bytes, std::uint64_t offset) {
  return bytes_detail::loadLittle<std::uint64_t>(bytes, offset);
}

/// In this machine's byte order, for memory that programs on it share.
inline std::optional<std::uint32_t> loadNative32(ByteSpan bytes, std::uint64_t offset) {
  return bytes_detail::loadNative<std::uint32_t>(bytes, offset);
}
inline std::optional<std::uint64_t> loadNative64(ByteSpan bytes, std::uint64_t offset) {
  return bytes_detail::loadNative<std::uint64_t>(bytes, offset);
}

/// The stores return false and write nothing when the word would not fit.
constexpr bool storeLittle16(MutableByteSpan bytes, std::uint64_t offset, std::uint16_t word) {
  return bytes_detail::storeLittle(bytes, offset, word);
}
constexpr bool storeLittle32(MutableByteSpan bytes, std::uint64_t offset, std::uint32_t word) {
  return bytes_detail::storeLittle(bytes, offset, word);
}
constexpr bool storeLittle64(MutableByteSpan bytes, std::uint64_t offset, std::uint64_t word) {
  return bytes_detail::storeLittle(bytes, offset, word);
}

inline ByteSpan asBytes(std::string_view text) {
  return std::as_bytes(std::span(text.data(), text.size()));
}

inline std::string_view asText(ByteSpan bytes) {
  return {reinterpret_cast<const char*>(bytes.data()), bytes.size()};
}

}  // namespace tavrel
