// The preferences that this system reads, and the form in which each takes effect.
#pragma once

#include <string>
#include <string_view>

#include "base/plist.h"

namespace tavrel {

/// What is wrong with `value` for that preference, and the right form. Empty when nothing is, or
/// when the system does not know the preference. A null value removes it, which is always right.
std::string faultOfPreference(std::string_view domain, std::string_view key,
                              const plist::Value& value);

}  // namespace tavrel
