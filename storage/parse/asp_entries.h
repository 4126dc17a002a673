// The entries of a statistics context, and the blocks that hold them.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string_view>

namespace tavrel {

/// Zero-terminated text of at most 98 characters; bytes after its end are undefined.
using ASPText = std::array<char, 100>;
inline constexpr std::size_t kLongestASPText = 98;

inline std::string_view asText(const ASPText& text) {
  const std::string_view field(text.data(), text.size());
  return field.substr(0, field.find('\0'));
}

struct ASPNameEntry {
  ASPText name;
  ASPNameEntry* next;
};

struct ASPValueEntry {
  ASPText text;  // the value in decimal
  std::uint64_t value;
  ASPValueEntry* next;
};

/// A statistic's two entries.
struct ASPEntryPair {
  ASPNameEntry name;
  ASPValueEntry value;
};

/// Blocks of entries, freed together.
class ASPEntryArena {
 public:
  ASPEntryArena() = default;
  ASPEntryArena(const ASPEntryArena&) = delete;
  ASPEntryArena& operator=(const ASPEntryArena&) = delete;
  ~ASPEntryArena();

  /// A pair of entries with content not set yet; null when memory runs out or the limit on entries
  /// is reached.
  ASPEntryPair* allocate() {
    if (next_ == end_ && !grow()) return nullptr;
    return next_++;
  }

 private:
  struct Block;

  bool grow();

  Block* blocks_ = nullptr;  // the newest first
  ASPEntryPair* next_ = nullptr;
  ASPEntryPair* end_ = nullptr;
  std::size_t allocated_ = 0;  // entry pairs in all blocks
};

}  // namespace tavrel
