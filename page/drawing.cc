#include "page/drawing.h"

#include "base/format.h"

namespace tavrel::page {

void beginDrawing(HtmlWriter& html, std::string_view name, std::size_t width, int height) {
  html.begin("svg", {{"role", "img"},
                     {"aria-label", name},
                     {"viewBox", format("0 0 %zu %d", width, height)},
                     {"preserveAspectRatio", "none"}});
}

}  // namespace tavrel::page
