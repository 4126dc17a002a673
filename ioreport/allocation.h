// Turns short memory into a result of the library, instead of an exception for its caller.
//
// This covers what the library builds: legends, channels, aggregates, samples, deltas, lists of
// interests, descriptions, and what getters cache. Exceptions of printing and of the platform's
// services pass through, and so do those of making a callback on the caller's side.
#pragma once

#include <new>

namespace tavrel {

/// What `make` returns, or an empty value of the same type when memory is short.
template <class Make>
auto madeOrNull(const Make& make) -> decltype(make()) {
  try {
    return make();
  } catch (const std::bad_alloc&) {
    return {};
  }
}

}  // namespace tavrel
