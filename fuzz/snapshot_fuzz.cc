// Snapshot records through both renderers. Whatever the bytes say, a text must be written whole, or
// cut where its buffer ends, or the descriptor is refused and nothing is written.
//
// Input: capacity and size of the descriptor (16 bits each), the descriptor, the records. The
// capacity's highest bit chooses the renderer, its lowest bit a text that is cut.
#include <cstdint>
#include <string>
#include <vector>

#include "require.h"
#include "storage/parse/snapshot_descriptor.h"
#include "storage/parse/snapshot_text.h"

namespace {

using namespace tavrel;
using fuzz::require;

// Enough for inputs of a few kB; cutting a longer text tests just as much.
constexpr std::size_t kRoom = 1U << 16;

struct Rendered {
  int answer;
  std::size_t length;
  std::vector<char> text;  // of exactly `capacity` bytes, for the sanitizer
};

template <class Render>
Rendered renderInto(std::size_t capacity, Render render) {
  Rendered out{0, capacity, std::vector<char>(capacity, '#')};
  out.answer = render(std::span(out.text), out.length);
  if (out.answer != 1) require(out.answer == 0 && out.length == capacity);
  return out;
}

std::string_view textOf(const Rendered& out, std::size_t length) {
  return {out.text.data(), length};
}

template <class Render>
void checkCapacities(std::size_t capacity, Render render) {
  const Rendered whole = renderInto(kRoom, render);
  const bool isWhole = whole.answer == 1;
  require(!isWhole || (whole.length < kRoom && whole.text[whole.length] == '\0'));
  const std::size_t length = isWhole ? whole.length : kRoom - 1;
  if (isWhole && capacity % 2 == 0) {
    const Rendered exact = renderInto(length + 1, render);
    return require(exact.answer == 1 && textOf(exact, length + 1) == textOf(whole, length + 1));
  }
  if (isWhole) capacity = capacity / 2 % (length + 1);
  if (capacity > length) return;
  const Rendered cut = renderInto(capacity, render);
  require(cut.answer == 0);
  if (capacity == 0) return;
  require(cut.text[capacity - 1] == '\0');
  require(textOf(cut, capacity - 1) == textOf(whole, capacity - 1));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const ByteSpan input = std::as_bytes(std::span(data, size));
  const auto capacity = loadLittle16(input, 0);
  const auto descriptorBytes = loadLittle16(input, 2);
  const auto part = descriptorBytes ? slice(input, 4, *descriptorBytes) : std::nullopt;
  if (!part) return 0;
  // Separate buffers, so that the sanitizer sees every read beyond their ends.
  const std::vector<std::byte> descriptor(part->begin(), part->end());
  const ByteSpan behind = input.subspan(4 + part->size());
  const std::vector<std::byte> records(behind.begin(), behind.end());

  const bool isInPlace = *capacity >= 1U << 15;
  const std::size_t room = *capacity % (1U << 15);
  if (!isInPlace) {
    checkCapacities(room, [&](std::span<char> text, std::size_t& length) {
      return ASPParseSnapshotBuffer(records, text, length);
    });
    return 0;
  }
  const auto inPlace = [&](std::span<char> text, std::size_t& length) {
    return ASPParseSnapshotBufferWithInplaceParser(records, text, length, descriptor);
  };
  const auto layout = readSnapshotDescriptor(descriptor, records.size());
  if (layout) {
    checkCapacities(room, inPlace);
  } else {
    require(!layout.error().message.empty());
    const Rendered refused = renderInto(16, inPlace);
    require(refused.answer == 0 && textOf(refused, 16) == std::string(16, '#'));
  }
  return 0;
}
