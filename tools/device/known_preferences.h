// The preferences that this system reads, and the form in which each takes effect.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "base/plist.h"

namespace tavrel {

struct PreferenceFault {
  std::string what;  // "preference Radio of domain com.norvane.da is a boolean, not 3"
  std::string cure;  // the command that sets it correctly: "give 'tavrelctl prefs set ...'"
};

/// Nothing when the value takes effect as that preference, or when the system does not know the
/// preference. A null value removes it, which is always right.
std::optional<PreferenceFault> faultOfPreference(std::string_view domain, std::string_view key,
                                                 const plist::Value& value);

}  // namespace tavrel
