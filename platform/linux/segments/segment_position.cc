#include "platform/linux/segments/segment_position.h"

#include <algorithm>

#include "base/bytes.h"
#include "client/segment_format.h"

namespace tavrel {
namespace {

// Layout, little-endian: u32 version, u32 cells, u32 chunks, u32 zero, u64 dropped, then the used
// cells and chunks, each as its u32 number, ascending, and its fields in order. The position at a
// segment's end is only the version `kEndVersion`.
constexpr std::uint32_t kVersion = 2;
constexpr std::uint32_t kEndVersion = 3;
constexpr std::size_t kHeadBytes = 24;
constexpr std::size_t kCellBytes = 20;
constexpr std::size_t kChunkBytes = 12;

template <class Word>
void append(std::string& out, Word word) {
  for (std::size_t i = 0; i < sizeof(Word); ++i)
    out += static_cast<char>(static_cast<unsigned char>(word >> (8 * i)));
}

template <class Part>
std::uint32_t countUsed(const std::vector<Part>& parts) {
  return static_cast<std::uint32_t>(parts.size()) -
         static_cast<std::uint32_t>(std::count(parts.begin(), parts.end(), Part{}));
}

// Appends the part whose number is at `at`; null when that number does not ascend or is too large.
template <class Part>
Part* nextPart(std::vector<Part>& parts, ByteSpan bytes, std::uint64_t at, std::uint32_t limit) {
  const std::uint32_t number = *loadLittle32(bytes, at);
  if (number < parts.size() || number >= limit) return nullptr;
  parts.resize(number + 1);
  return &parts.back();
}

}  // namespace

std::string SegmentPosition::encode() const {
  if (isEnd) {
    std::string out;
    append(out, kEndVersion);
    return out;
  }
  const std::uint32_t usedCells = countUsed(cells);
  const std::uint32_t usedChunks = countUsed(chunks);
  std::string out;
  out.reserve(bytesOf(usedCells, usedChunks));
  append(out, kVersion);
  append(out, usedCells);
  append(out, usedChunks);
  append(out, std::uint32_t{0});
  append(out, dropped);
  for (std::uint32_t number = 0; number < cells.size(); ++number) {
    const Cell& cell = cells[number];
    if (cell == Cell{}) continue;
    append(out, number);
    append(out, cell.sets);
    append(out, static_cast<std::uint64_t>(cell.value));
  }
  for (std::uint32_t number = 0; number < chunks.size(); ++number) {
    const Chunk& chunk = chunks[number];
    if (chunk == Chunk{}) continue;
    append(out, number);
    append(out, chunk.generation);
    append(out, chunk.folded);
  }
  return out;
}

std::size_t SegmentPosition::bytesOf(std::size_t cells, std::size_t chunks) {
  return kHeadBytes + cells * kCellBytes + chunks * kChunkBytes;
}

Expected<SegmentPosition> SegmentPosition::decode(std::string_view text) {
  const Error refused{"not the position of a segment"};
  const ByteSpan bytes = asBytes(text);
  if (bytes.size() == sizeof kEndVersion && loadLittle32(bytes, 0) == kEndVersion) return end();
  const std::uint32_t usedCells = loadLittle32(bytes, 4).value_or(0);
  const std::uint32_t usedChunks = loadLittle32(bytes, 8).value_or(0);
  if (loadLittle32(bytes, 0) != kVersion || usedCells > kBHCellCount ||
      usedChunks > kBHChunkCount || bytes.size() != bytesOf(usedCells, usedChunks)) {
    return refused;
  }
  SegmentPosition position;
  position.isKnown = true;
  position.dropped = *loadLittle64(bytes, 16);
  std::uint64_t at = kHeadBytes;
  for (std::uint32_t i = 0; i < usedCells; ++i, at += kCellBytes) {
    Cell* const cell = nextPart(position.cells, bytes, at, kBHCellCount);
    if (cell == nullptr) return refused;
    *cell = {*loadLittle64(bytes, at + 4),
             static_cast<std::int64_t>(*loadLittle64(bytes, at + 12))};
  }
  for (std::uint32_t i = 0; i < usedChunks; ++i, at += kChunkBytes) {
    Chunk* const chunk = nextPart(position.chunks, bytes, at, kBHChunkCount);
    if (chunk == nullptr) return refused;
    *chunk = {*loadLittle32(bytes, at + 4), *loadLittle32(bytes, at + 8)};
  }
  return position;
}

}  // namespace tavrel
