// Memory that is short: an answer of the library, not an exception of its caller's.
//
// So it is for what the library builds: legends, channels, aggregates, samples, deltas, lists of
// interests, descriptions, and what getters keep. What printing and the services of the platform
// throw passes through, and so does what making a callback throws on the caller's side.
#pragma once

#include <new>

namespace tavrel {

/// What `make` returns, or an empty one of the same type when memory is short.
template <class Make>
auto madeOrNull(const Make& make) -> decltype(make()) {
  try {
    return make();
  } catch (const std::bad_alloc&) {
    return {};
  }
}

}  // namespace tavrel
