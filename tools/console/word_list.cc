#include "tools/console/word_list.h"

namespace tavrel {

std::string listed(std::span<const std::string> words, std::string_view conjunction) {
  std::string text;
  for (std::size_t i = 0; i < words.size(); ++i) {
    const bool isLast = i + 1 == words.size();
    if (i > 0) text.append(isLast ? " " : ", ");
    if (i > 0 && isLast) text.append(conjunction).append(" ");
    text += words[i];
  }
  return text;
}

}  // namespace tavrel
