// Memory for many small pieces that are all released at once.
//
// The first touch of a page costs more than what is stored in it. Therefore the kernel is asked to
// provide all pages of a slab in one call.
#pragma once

#include <cstddef>
#include <vector>

namespace tavrel {

class SampleMemory {
 public:
  SampleMemory() = default;
  ~SampleMemory();
  SampleMemory(const SampleMemory&) = delete;
  SampleMemory& operator=(const SampleMemory&) = delete;

  /// Aligned for numbers; `bytes` is at most 32 KiB. Valid until `reuse`. Throws `std::bad_alloc`.
  std::byte* take(std::size_t bytes);
  /// Releases all pieces and keeps the slabs for the next ones.
  void reuse();

 private:
  struct Slab {
    std::byte* begin;
    std::size_t bytes;
  };
  void addSlab();

  std::vector<Slab> slabs_;
  std::size_t next_ = 0;  // slab to use after the current one
  std::byte* free_ = nullptr;
  std::size_t left_ = 0;
};

}  // namespace tavrel
