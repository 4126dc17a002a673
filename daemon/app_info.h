// The list of activated applications, from a client's message to the log.
#pragma once

#include <optional>
#include <string>

#include "base/plist.h"

namespace tavrel {

/// The text of a UUID given as 16 bytes or as text; nothing for any other value.
std::optional<std::string> appUuidFrom(const plist::Value& value);

/// Converts the elements of "app_data" to entries of the log, in order. Leaves out an element that
/// is no dictionary or lacks its identifier, version or UUID (16 bytes, or their text); a missing
/// number reads as 0.
plist::Array appInfoFrom(const plist::Array& appData);

}  // namespace tavrel
