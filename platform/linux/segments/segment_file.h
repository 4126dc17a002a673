// Low-level access to a segment's file: bytes, header, names of keys.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

#include "base/bytes.h"

namespace tavrel {

/// What the header claims about the process that made the segment. It may be false.
struct SegmentFacts {
  std::array<std::byte, 16> identity{};
  std::array<std::byte, 16> boot{};
  std::uint64_t pidNamespace = 0;
  std::uint64_t processStart = 0;  // clock ticks since boot
  std::uint32_t pid = 0;
};

/// Bytes beyond the end, for example of a truncated file, read as zero. So do those that cannot be
/// read; see `error`.
class SegmentFile {
 public:
  /// Borrows the descriptor.
  explicit SegmentFile(int descriptor) : descriptor_(descriptor) {}

  void read(std::uint64_t offset, MutableByteSpan into) const;
  std::uint32_t word32(std::uint64_t offset) const;
  std::uint64_t word64(std::uint64_t offset) const;

  SegmentFacts facts() const;

  /// The error number of the last failed read, 0 when none failed.
  int error() const { return error_; }

  /// The name of the key with this number; null when there is no valid one of this kind. It stays
  /// in place as long as this object lives.
  const std::string* key(std::uint32_t number, std::uint8_t kind) {
    if (number < kinds_.size() && kinds_[number] == kind) return &names_[number];
    return readKey(number, kind);
  }

 private:
  const std::string* readKey(std::uint32_t number, std::uint8_t kind);
  void readKeys(std::uint32_t number);

  int descriptor_;
  mutable int error_ = 0;
  // By number; filled at the first request. Kinds are kept apart from names, to stay in the cache.
  std::vector<std::uint8_t> kinds_;
  std::vector<std::string> names_;
};

}  // namespace tavrel
