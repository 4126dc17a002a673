#include "platform/linux/store/sample_memory.h"

#include <algorithm>
#include <new>
#include <sys/mman.h>

namespace tavrel {
namespace {

constexpr std::size_t kSmallest = 64U << 10;
constexpr std::size_t kLargest = 1U << 20;
constexpr std::size_t kAlignment = 16;

std::byte* map(std::size_t bytes) {
  void* const begin =
      mmap(nullptr, bytes, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  if (begin == MAP_FAILED) throw std::bad_alloc();
  // Without kernel support for this advice, each page is provided at its first use.
  static_cast<void>(madvise(begin, bytes, MADV_POPULATE_WRITE));
  return static_cast<std::byte*>(begin);
}

}  // namespace

SampleMemory::~SampleMemory() {
  for (const Slab& slab : slabs_)
    munmap(slab.begin, slab.bytes);
}

std::byte* SampleMemory::take(std::size_t bytes) {
  bytes = (bytes + kAlignment - 1) / kAlignment * kAlignment;
  if (bytes > left_) {
    if (next_ == slabs_.size()) addSlab();
    free_ = slabs_[next_].begin;
    left_ = slabs_[next_].bytes;
    ++next_;
  }
  std::byte* const taken = free_;
  free_ += bytes;
  left_ -= bytes;
  return taken;
}

void SampleMemory::addSlab() {
  const std::size_t bytes =
      slabs_.empty() ? kSmallest : std::min(2 * slabs_.back().bytes, kLargest);
  // Reserve first, so that nothing can fail between the mapping and its entry.
  slabs_.reserve(slabs_.size() + 1);
  slabs_.push_back({map(bytes), bytes});
}

void SampleMemory::reuse() {
  next_ = 0;
  left_ = 0;
}

}  // namespace tavrel
