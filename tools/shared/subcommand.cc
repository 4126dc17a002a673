#include "tools/shared/subcommand.h"

#include <cstdint>

#include "base/format.h"
#include "base/parse_number.h"

namespace tavrel {

std::string countFault(const std::string& text, const char* things) {
  if (parseNumber<std::uint32_t>(text).value_or(0) > 0) return {};
  return format("not a number of %s: %s: give 1 or more", things, text);
}

}  // namespace tavrel
