// Words listed in a sentence.
#pragma once

#include <span>
#include <string>
#include <string_view>

namespace tavrel {

/// "a, b or c", with the conjunction "or".
std::string listed(std::span<const std::string> words, std::string_view conjunction);

}  // namespace tavrel
