// The version of tavrel, as set in the top-level CMakeLists.txt.
#pragma once

#include <string_view>

namespace tavrel {

/// Such as "0.1.0".
std::string_view version();

}  // namespace tavrel
