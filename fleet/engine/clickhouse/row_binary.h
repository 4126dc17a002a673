// ClickHouse's row format: numbers are little-endian, each text is preceded by its length.
#pragma once

#include <string>
#include <string_view>
#include <type_traits>

#include "base/copy_little.h"

namespace tavrel::fleet {

template <class Number>
requires std::is_arithmetic_v<Number>
void put(std::string& out, Number number) {
  char bytes[sizeof number];
  copyLittle(bytes, &number, sizeof number);
  out.append(bytes, sizeof bytes);
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
