#include "base/instant.h"

#include <cmath>

#include "base/arithmetic.h"
#include "base/civil_time.h"

namespace tavrel {

std::int64_t wholeSeconds(plist::Date instant) {
  return saturatingInt64(std::floor(instant.secondsSince1970()));
}

std::int64_t dayOf(plist::Date instant) {
  return dayOfSecond(wholeSeconds(instant));
}

}  // namespace tavrel
