#include "base/system_text.h"

#include <array>
#include <cstring>

namespace tavrel {

std::string systemText(int code) {
  std::array<char, 128> buffer{};
  // The GNU variant, which need not use the buffer.
  return strerror_r(code, buffer.data(), buffer.size());
}

}  // namespace tavrel
