// How programs end when an exception gets as far as `main`, their output is lost, or they are
// misused.
#pragma once

#include <cstdio>
#include <exception>

namespace tavrel {

inline constexpr const char* kOutputIsLost =
    "cannot write standard output: free space or check the pipe";

/// The exit status that `body` returns; 1, and a line that says so, when `stdout` cannot be
/// written; 1, and the line "NAME: out of memory", when it throws. All other failures have been
/// reported by then, and a longer line could take memory.
template <class Body>
int exitStatusOf(const char* name, Body body) noexcept {
  try {
    const int status = body();
    if (std::fflush(stdout) == 0 && std::ferror(stdout) == 0) return status;
    std::fprintf(stderr, "%s: %s\n", name, kOutputIsLost);
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
