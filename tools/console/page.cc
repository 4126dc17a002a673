#include "tools/console/page.h"

#include "base/format.h"

namespace tavrel {

std::string Page::styled(std::string_view text, Emphasis emphasis) const {
  if (!isColoured || emphasis == Emphasis::None || text.empty()) return std::string(text);
  const char* const codes = emphasis == Emphasis::Alarm ? "1;31" : "1";
  return format("\x1b[%sm%s\x1b[0m", codes, text);
}

}  // namespace tavrel
