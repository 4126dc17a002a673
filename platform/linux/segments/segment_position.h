// How far a segment has been folded. A store remembers this with the values that it took, so that
// each is taken once.
//
// An encoded position holds only what was folded of the segment, 20 bytes per cell and 12 per
// chunk; claims of its header and refused values take no space. A fold bounds the bytes of each
// user's positions. A segment that was folded to its end, and to which nobody can write, needs no
// more than a mark.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "base/expected.h"

namespace tavrel {

struct SegmentPosition {
  /// The folded part of a scalar's cell.
  struct Cell {
    std::uint64_t sets = 0;
    std::int64_t value = 0;
    bool operator==(const Cell&) const = default;
  };
  /// A chunk of records: how many of this generation have been folded.
  struct Chunk {
    std::uint32_t generation = 0;
    std::uint32_t folded = 0;
    bool operator==(const Chunk&) const = default;
  };

  std::vector<Cell> cells;
  std::vector<Chunk> chunks;
  std::uint64_t dropped = 0;  // values that the program lost and that have been reported
  bool isEnd = false;         // nothing is left to fold or ever will be; the rest is empty
  bool isKnown = false;       // whether a read or a store has set it

  static SegmentPosition end() {
    return {.cells = {}, .chunks = {}, .isEnd = true, .isKnown = true};
  }
  bool operator==(const SegmentPosition&) const = default;

  std::string encode() const;
  /// The size in bytes of a position with that many parts.
  static std::size_t bytesOf(std::size_t cells, std::size_t chunks);
  /// Without unused parts at the ends. Refuses bytes that `encode` did not write.
  static Expected<SegmentPosition> decode(std::string_view bytes);
};

}  // namespace tavrel
