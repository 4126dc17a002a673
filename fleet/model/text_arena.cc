#include "fleet/model/text_arena.h"

#include <algorithm>

namespace tavrel::fleet {

namespace {
constexpr std::size_t kBlockBytes = 16 * 1024;
}

std::string_view TextArena::keep(std::string_view text) {
  if (text.size() > left_) {
    const std::size_t size = std::max(kBlockBytes, text.size());
    blocks_.push_back(std::make_unique_for_overwrite<char[]>(size));
    next_ = blocks_.back().get();
    left_ = size;
  }
  char* const kept = next_;
  std::copy(text.begin(), text.end(), kept);
  next_ += text.size();
  left_ -= text.size();
  return {kept, text.size()};
}

void TextArena::clear() {
  blocks_.clear();
  next_ = nullptr;
  left_ = 0;
}

}  // namespace tavrel::fleet
