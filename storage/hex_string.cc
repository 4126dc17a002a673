#include "storage/hex_string.h"

#include <algorithm>

#include "base/format.h"

namespace tavrel {

std::uint8_t hexStringToByte(StandardStreams& streams, std::string_view text) {
  std::uint32_t byte = 0;
  for (char c : text.substr(0, 2)) {
    byte <<= 4;
    if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
    if (c >= '0' && c <= '9') {
      byte += static_cast<std::uint32_t>(c - '0');
    } else if (c >= 'a' && c <= 'f') {
      byte += static_cast<std::uint32_t>(c - 'a' + 10);
    } else {
      streams.writeOutput(format("unrecognized hex character: %c", c));
    }
  }
  return static_cast<std::uint8_t>(byte);
}

std::uint32_t hexStringToInt32(StandardStreams& streams, std::string_view text) {
  text = text.substr(0, 8);
  std::uint32_t number = 0;
  while (!text.empty()) {
    number = number << 8 | hexStringToByte(streams, text);
    text.remove_prefix(std::min<std::size_t>(2, text.size()));
  }
  return number;
}

}  // namespace tavrel
