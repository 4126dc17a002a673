// How programs end when an exception gets as far as `main`.
#pragma once

#include <cstdio>
#include <exception>

namespace tavrel {

/// The exit status that `body` returns; 1, and the line "NAME: out of memory", when it throws. All
/// other failures have been reported by then, and a longer line could take memory.
template <class Body>
int exitStatusOf(const char* name, Body body) noexcept {
  try {
    return body();
  } catch (const std::exception&) {
    std::fputs(name, stderr);
    std::fputs(": out of memory\n", stderr);
  }
  return 1;
}

}  // namespace tavrel
