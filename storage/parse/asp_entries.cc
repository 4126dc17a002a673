#include "storage/parse/asp_entries.h"

#include <algorithm>
#include <new>
#include <type_traits>

#include "base/limits.h"

namespace tavrel {
namespace {

// Enough for all entries of a real buffer. Pages without entries cost nothing.
constexpr std::size_t kBlockPairs = 1400;

}  // namespace

/// Followed in memory by its entries.
struct alignas(ASPEntryPair) ASPEntryArena::Block {
  Block* previous;
};

ASPEntryArena::~ASPEntryArena() {
  while (blocks_) {
    Block* const previous = blocks_->previous;
    ::operator delete(blocks_);
    blocks_ = previous;
  }
}

bool ASPEntryArena::grow() {
  static_assert(sizeof(Block) % alignof(ASPEntryPair) == 0);
  static_assert(alignof(ASPEntryPair) <= __STDCPP_DEFAULT_NEW_ALIGNMENT__);
  static_assert(std::is_trivially_destructible_v<ASPEntryPair>);
  const std::size_t count = std::min(kBlockPairs, limits::kStatisticsEntries - allocated_);
  if (count == 0) return false;
  void* const memory = ::operator new(sizeof(Block) + count * sizeof(ASPEntryPair), std::nothrow);
  if (!memory) return false;
  blocks_ = ::new (memory) Block{blocks_};
  next_ = ::new (blocks_ + 1) ASPEntryPair[count];
  end_ = next_ + count;
  allocated_ += count;
  return true;
}

}  // namespace tavrel
