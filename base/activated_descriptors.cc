#include "base/activated_descriptors.h"

#include <cstdlib>

#include "base/parse_number.h"

namespace tavrel {
namespace {

// The positive number in an environment variable; 0 when there is none.
int positiveNumberFrom(const char* variable) {
  const char* const text = std::getenv(variable);
  if (text == nullptr) return 0;
  const auto number = parseNumber<int>(text);
  return number && *number > 0 ? *number : 0;
}

}  // namespace

int activatedDescriptors(int process) {
  return positiveNumberFrom("LISTEN_PID") == process ? positiveNumberFrom("LISTEN_FDS") : 0;
}

}  // namespace tavrel
