#include "fleet/engine/clickhouse/native_block.h"

namespace tavrel::fleet {
namespace {

struct TooShort {};
struct Malformed {};

std::uint64_t takeSize(std::string_view& bytes) {
  std::uint64_t size = 0;
  for (int shift = 0; shift < 64; shift += 7) {
    if (bytes.empty()) throw TooShort();
    const auto byte = static_cast<std::uint8_t>(bytes.front());
    bytes.remove_prefix(1);
    size |= std::uint64_t{byte & 0x7FU} << shift;
    if (byte < 0x80) return size;
  }
  throw Malformed();
}

std::string_view takeBytes(std::string_view& bytes, std::uint64_t size) {
  if (bytes.size() < size) throw TooShort();
  const std::string_view taken = bytes.substr(0, static_cast<std::size_t>(size));
  bytes.remove_prefix(taken.size());
  return taken;
}

/// Bytes of a value; 0 for texts, which vary.
std::size_t widthOf(std::string_view type) {
  if (type == "String") return 0;
  if (type == "UInt8") return 1;
  return type == "Int32" ? 4 : 8;
}

}  // namespace

NativeBlock::Found NativeBlock::find(std::string_view bytes,
                                     std::span<const std::string_view> types) {
  columns_.clear();
  std::string_view rest = bytes;
  try {
    if (takeSize(rest) != types.size()) return Found::Other;
    const std::uint64_t rows = takeSize(rest);
    for (const std::string_view type : types) {
      takeBytes(rest, takeSize(rest));  // the column's name
      if (takeBytes(rest, takeSize(rest)) != type) return Found::Other;
      // Each value takes at least a byte.
      if (rest.size() < rows) return Found::Part;
      columns_.push_back(rest.data());
      if (const std::size_t width = widthOf(type); width != 0) {
        if (rest.size() / width < rows) return Found::Part;
        takeBytes(rest, rows * width);
      } else {
        for (std::uint64_t row = 0; row < rows; ++row)
          takeBytes(rest, takeSize(rest));
      }
    }
    rows_ = static_cast<std::size_t>(rows);
  } catch (const TooShort&) {
    return Found::Part;
  } catch (const Malformed&) {
    return Found::Other;
  }
  size_ = bytes.size() - rest.size();
  return Found::Block;
}

void NativeBlock::take(const char*& next, std::string_view& text) {
  constexpr std::size_t kLongestSize = 10;
  // `find` has checked that the text is complete.
  std::string_view size(next, kLongestSize);
  const std::uint64_t length = takeSize(size);
  text = {size.data(), static_cast<std::size_t>(length)};
  next = text.data() + text.size();
}

}  // namespace tavrel::fleet
