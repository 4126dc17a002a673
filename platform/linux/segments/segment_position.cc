#include "platform/linux/segments/segment_position.h"

#include "base/bytes.h"
#include "client/segment_format.h"

namespace tavrel {
namespace {

// Layout, little-endian: u32 version, u32 cells, u32 chunks, u32 zero, u64 dropped, then the cells
// and the chunks with their fields in order.
constexpr std::uint32_t kVersion = 1;
constexpr std::uint64_t kHeadBytes = 24;
constexpr std::uint64_t kCellBytes = 16;
constexpr std::uint64_t kChunkBytes = 8;

template <class Word>
void append(std::string& out, Word word) {
  for (std::size_t i = 0; i < sizeof(Word); ++i)
    out += static_cast<char>(static_cast<unsigned char>(word >> (8 * i)));
}

}  // namespace

std::string SegmentPosition::encode() const {
  std::string out;
  out.reserve(kHeadBytes + cells.size() * kCellBytes + chunks.size() * kChunkBytes);
  append(out, kVersion);
  append(out, static_cast<std::uint32_t>(cells.size()));
  append(out, static_cast<std::uint32_t>(chunks.size()));
  append(out, std::uint32_t{0});
  append(out, dropped);
  for (const Cell& cell : cells) {
    append(out, cell.sets);
    append(out, static_cast<std::uint64_t>(cell.value));
  }
  for (const Chunk& chunk : chunks) {
    append(out, chunk.generation);
    append(out, chunk.folded);
  }
  return out;
}

Expected<SegmentPosition> SegmentPosition::decode(std::string_view text) {
  const ByteSpan bytes = asBytes(text);
  const std::uint32_t cells = loadLittle32(bytes, 4).value_or(0);
  const std::uint32_t chunks = loadLittle32(bytes, 8).value_or(0);
  if (loadLittle32(bytes, 0) != kVersion || cells > kBHCellCount || chunks > kBHChunkCount ||
      bytes.size() != kHeadBytes + cells * kCellBytes + chunks * kChunkBytes) {
    return Error{"not the position of a segment"};
  }
  SegmentPosition position;
  position.dropped = *loadLittle64(bytes, 16);
  std::uint64_t at = kHeadBytes;
  for (std::uint32_t i = 0; i < cells; ++i, at += kCellBytes) {
    position.cells.push_back(
        {*loadLittle64(bytes, at), static_cast<std::int64_t>(*loadLittle64(bytes, at + 8))});
  }
  for (std::uint32_t i = 0; i < chunks; ++i, at += kChunkBytes)
    position.chunks.push_back({*loadLittle32(bytes, at), *loadLittle32(bytes, at + 4)});
  return position;
}

}  // namespace tavrel
