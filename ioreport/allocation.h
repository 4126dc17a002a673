// Turns a lack of memory into a result of the library, instead of an exception for its caller.
//
// This covers everything that the library builds: legends, channels, aggregates, samples, deltas,
// lists of interests, descriptions, and the values that getters cache. Exceptions from printing,
// from the platform's services and from the caller's making of a callback pass through.
#pragma once

#include <new>

namespace tavrel {

/// The result of `make`, or an empty value of the same type when memory runs out.
template <class Make>
auto madeOrNull(const Make& make) -> decltype(make()) {
  try {
    return make();
  } catch (const std::bad_alloc&) {
    return {};
  }
}

}  // namespace tavrel
