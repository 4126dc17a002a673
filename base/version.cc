#include "base/version.h"

namespace tavrel {

std::string_view version() {
  return TAVREL_VERSION;
}

}  // namespace tavrel
