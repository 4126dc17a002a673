// The version of tavrel, which CMakeLists.txt of the top folder states.
#pragma once

#include <string_view>

namespace tavrel {

/// Such as "0.1.0".
std::string_view version();

}  // namespace tavrel
