// Instants as whole seconds and days, in UTC.
#pragma once

#include <cstdint>

#include "base/plist.h"

namespace tavrel {

/// Seconds since 1970-01-01 00:00:00 UTC, rounded down, saturated; 0 for not-a-number.
std::int64_t wholeSeconds(plist::Date instant);

/// The day of an instant, in days since 1970-01-01.
std::int64_t dayOf(plist::Date instant);

}  // namespace tavrel
