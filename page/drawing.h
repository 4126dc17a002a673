// Code that all charts share: an SVG image that is stretched to fill its place.
#pragma once

#include <cstddef>
#include <string_view>

#include "page/html_writer.h"

namespace tavrel::page {

/// Begins a drawing, sized in units; `HtmlWriter::end` ends it. `name` is its accessible name.
void beginDrawing(HtmlWriter& html, std::string_view name, std::size_t width, int height);

}  // namespace tavrel::page
