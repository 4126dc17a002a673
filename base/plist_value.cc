#include <algorithm>
#include <cmath>

#include "base/plist.h"
#include "base/plist_reps.h"

namespace tavrel::plist {
namespace {

// Compares an integer with a double without rounding the integer.
bool equalsReal(std::int64_t integer, bool isUnsigned, double real) {
  if (std::isnan(real) || std::trunc(real) != real) return false;
  if (isUnsigned) {
    return real >= 0 && real < 18446744073709551616.0 &&
           static_cast<std::uint64_t>(real) == static_cast<std::uint64_t>(integer);
  }
  return real >= -9223372036854775808.0 && real < 9223372036854775808.0 &&
         static_cast<std::int64_t>(real) == integer;
}

bool equalEntries(const Dictionary& a, const Dictionary& b) {
  if (a.isSame(b)) return true;
  if (a.size() != b.size()) return false;
  return std::ranges::all_of(a,
                             [&](const Entry& entry) { return entry.value == b.get(entry.key); });
}

bool equalElements(const Array& a, const Array& b) {
  return a.isSame(b) || std::equal(a.begin(), a.end(), b.begin(), b.end());
}

}  // namespace

bool operator==(const Number& a, const Number& b) {
  if (a.isFloating() && b.isFloating()) {
    return a.real() == b.real() || (std::isnan(a.real()) && std::isnan(b.real()));
  }
  if (a.isFloating()) return equalsReal(b.int64(), b.kind_ == NumberKind::UInt64, a.real());
  if (b.isFloating()) return equalsReal(a.int64(), a.kind_ == NumberKind::UInt64, b.real());
  const bool sameSignedness = (a.kind_ == NumberKind::UInt64) == (b.kind_ == NumberKind::UInt64);
  return a.bits_ == b.bits_ && (sameSignedness || a.int64() >= 0);
}

std::optional<std::string_view> Value::string() const {
  if (kind_ != Kind::String) return std::nullopt;
  if (!payload_.shared) return std::string_view();
  const auto* rep = static_cast<const detail::StringRep*>(payload_.shared);
  return std::string_view(rep->text(), rep->length);
}

bool operator==(const Value& a, const Value& b) {
  if (a.kind_ != b.kind_) return false;
  switch (a.kind_) {
    case Kind::Null:
      return true;
    case Kind::Boolean:
      return a.payload_.bits == b.payload_.bits;
    case Kind::Number:
      return a.number() == b.number();
    case Kind::Date:
      return a.date() == b.date();
    case Kind::String:
      return a.string() == b.string();
    case Kind::Data:
      return std::ranges::equal(a.data().bytes(), b.data().bytes());
    case Kind::Array:
      return equalElements(a.array(), b.array());
    case Kind::Dictionary:
      return equalEntries(a.dictionary(), b.dictionary());
  }
  return false;
}

}  // namespace tavrel::plist
