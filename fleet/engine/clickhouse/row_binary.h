// ClickHouse's row format: numbers as they are in memory, texts behind their length.
#pragma once

#include <bit>
#include <concepts>
#include <cstdint>
#include <cstring>
#include <optional>
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

/// Takes rows apart that arrive in pieces. Each operation is false when there are too few bytes.
class RowReader {
 public:
  explicit RowReader(std::string_view bytes) : bytes_(bytes) {}

  template <class Number>
  requires std::is_arithmetic_v<Number>
  bool get(Number& number) {
    if (bytes_.size() < sizeof number) return false;
    std::memcpy(&number, bytes_.data(), sizeof number);
    bytes_.remove_prefix(sizeof number);
    return true;
  }

  bool get(std::string_view& text) {
    std::uint64_t size = 0;
    std::uint8_t byte = 0x80;
    for (int shift = 0; byte >= 0x80; shift += 7) {
      if (shift > 63 || !get(byte)) return false;
      size |= std::uint64_t{byte & 0x7FU} << shift;
    }
    if (bytes_.size() < size) return false;
    text = bytes_.substr(0, static_cast<std::size_t>(size));
    bytes_.remove_prefix(text.size());
    return true;
  }

  template <class... Values>
  bool getAll(Values&... values) {
    return (get(values) && ...);
  }

  std::size_t left() const { return bytes_.size(); }

 private:
  std::string_view bytes_;
};

}  // namespace tavrel::fleet
