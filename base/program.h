// How programs end when an exception gets as far as `main`, or when they are misused.
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

/// For an argument that the program does not take: says so and returns the exit status.
inline int refuseArgument(const char* name, const char* argument) {
  std::fprintf(stderr, "%s: unexpected argument '%s': see --help\n", name, argument);
  return 2;
}

}  // namespace tavrel
