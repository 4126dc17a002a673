// Compares the walk over a kernel snapshot with a recursive one, whose depth stays safe for inputs
// of a few kB. Both must find the same thread and stop at the same item.
//
// Input: one byte. If it is even, the items follow verbatim; if it is odd, each further byte makes
// one item: three bits for its type, two for its identifier, three for its payload's length.
#include <algorithm>
#include <cstdint>
#include <cstring>
#include <string>
#include <vector>

#include "require.h"
#include "storage/vm_freezer.h"

namespace {

using namespace tavrel;
using fuzz::require;

constexpr std::uint32_t kTypes[] = {0x13, 0x14, 0x13, 0x14, 0x909, 0x901, 0x20, 0xF19158ED};
constexpr char kName[] = "VM_swapout";

std::vector<std::byte> itemsFrom(ByteSpan codes) {
  std::vector<std::byte> out;
  for (const std::byte code : codes) {
    const auto bits = std::to_integer<unsigned>(code);
    const std::uint32_t type = kTypes[bits % 8];
    const std::uint32_t length = bits >> 5;
    const std::size_t at = out.size();
    out.resize(at + 16 + length);
    storeLittle32(out, at, type);
    storeLittle32(out, at + 4, length);
    storeLittle64(out, at + 8, bits / 8 % 4);
    for (std::size_t i = 0; i < length; ++i)
      out[at + 16 + i] = static_cast<std::byte>(bits / 8 % 4 == 3 ? "other"[i % 5] : kName[i]);
  }
  return out;
}

// Offsets of the items as the recursion finds them. An
// incomplete item stops every level.
struct Reference {
  ByteSpan bytes;

  bool isPresent(std::size_t at) const {
    return slice(bytes, at, 16) && slice(bytes, at + 16, size(at));
  }
  std::uint32_t type(std::size_t at) const { return *loadLittle32(bytes, at); }
  std::uint32_t size(std::size_t at) const { return *loadLittle32(bytes, at + 4); }
  std::uint64_t flags(std::size_t at) const { return *loadLittle64(bytes, at + 8); }
  std::size_t next(std::size_t at) const { return isPresent(at) ? at + 16 + size(at) : at; }
  bool begins(std::size_t at) const { return type(at) == 0x13 && size(at) >= 4; }

  bool find(std::size_t at, std::optional<ByteSpan>& statistics,
            std::optional<std::size_t>& position) const {
    for (;; at = next(at)) {
      if (!isPresent(at) || type(at) == 0xF19158ED) return false;
      if (begins(at)) break;
    }
    const std::uint64_t identifier = flags(at);
    std::optional<std::size_t> name;
    std::optional<ByteSpan> own;
    for (at = next(at);; at = next(at)) {
      if (!isPresent(at) || type(at) == 0xF19158ED) break;
      if (type(at) == 0x14 && flags(at) == identifier) break;
      if (begins(at)) {
        std::optional<std::size_t> stop;
        if (find(at, own, stop)) {
          statistics = own;
          position = stop;
          return true;
        }
        at = stop.value();
      } else if (type(at) == 0x909) {
        name = at;
      } else if (type(at) == 0x901) {
        own = bytes.subspan(at + 16, size(at));
      }
    }
    position = at;
    if (!name) return false;
    const std::size_t length = std::min<std::size_t>(size(*name), 64);
    const std::string text(asText(bytes.subspan(*name + 16, length)));
    if (std::strncmp(text.c_str(), kName, length) != 0) return false;
    statistics = own;
    return true;
  }
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  if (size == 0) return 0;
  const ByteSpan rest = std::as_bytes(std::span(data + 1, size - 1));
  const std::vector<std::byte> items =
      data[0] % 2 == 0 ? std::vector<std::byte>(rest.begin(), rest.end()) : itemsFrom(rest);

  std::optional<ByteSpan> expected, found;
  std::optional<std::size_t> stop;
  ByteSpan position;
  const bool isThere = Reference{items}.find(0, expected, stop);
  require(getIOStatsWithThreadnameFromKCDataHelper(items, kName, found, &position) == isThere);
  require(found.has_value() == expected.has_value());
  if (found) require(found->data() == expected->data() && found->size() == expected->size());
  if (stop) {
    require(position.data() == items.data() + *stop && position.size() == items.size() - *stop);
  } else {
    require(position.data() == nullptr);
  }
  return 0;
}
