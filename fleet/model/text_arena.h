// Texts that live as long as their arena. Moving the arena does not move them.
#pragma once

#include <cstddef>
#include <memory>
#include <string_view>
#include <vector>

namespace tavrel::fleet {

class TextArena {
 public:
  /// A copy of the text, valid until the arena is destroyed or cleared.
  std::string_view keep(std::string_view text);
  void clear();

 private:
  std::vector<std::unique_ptr<char[]>> blocks_;
  char* next_ = nullptr;
  std::size_t left_ = 0;
};

}  // namespace tavrel::fleet
