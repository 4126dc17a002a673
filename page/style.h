// The style sheet of pages (page/style.css).
#pragma once

#include <string_view>

namespace tavrel::page {

extern const std::string_view kStyle;

}  // namespace tavrel::page
