// A condition that does not hold is a finding.
#pragma once

#include <cstdlib>

namespace tavrel::fuzz {

inline void require(bool holds) {
  if (!holds) std::abort();
}

}  // namespace tavrel::fuzz
