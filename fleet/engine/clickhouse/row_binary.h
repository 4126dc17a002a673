// ClickHouse's row format: numbers as they are in memory, each text preceded by its length.
#pragma once

#include <bit>
#include <string>
#include <string_view>
#include <type_traits>

namespace tavrel::fleet {

static_assert(std::endian::native == std::endian::little, "the format is little-endian");

template <class Number>
requires std::is_arithmetic_v<Number>
void put(std::string& out, Number number) {
  out.append(reinterpret_cast<const char*>(&number), sizeof number);
}

inline void put(std::string& out, std::string_view text) {
  std::size_t size = text.size();
  for (; size >= 0x80; size >>= 7)
    out += static_cast<char>((size & 0x7F) | 0x80);
  out += static_cast<char>(size);
  out += text;
}

template <class... Values>
void putAll(std::string& out, const Values&... values) {
  (put(out, values), ...);
}

}  // namespace tavrel::fleet
