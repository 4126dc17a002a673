// Comparing and printing property lists in tests.
#pragma once

#include <ostream>

#include "base/plist.h"
#include "base/text.h"

namespace tavrel::plist {

/// Equal content; an empty handle equals only an empty handle.
inline bool operator==(const Dictionary& a, const Dictionary& b) {
  return Value(a) == Value(b);
}
inline bool operator==(const Array& a, const Array& b) {
  return Value(a) == Value(b);
}

inline void PrintTo(const Value& value, std::ostream* out) {
  *out << textOf(value);
}
inline void PrintTo(const Dictionary& value, std::ostream* out) {
  *out << textOf(value);
}
inline void PrintTo(const Array& value, std::ostream* out) {
  *out << textOf(value);
}

}  // namespace tavrel::plist
