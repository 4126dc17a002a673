// The list of activated applications, from a client's message to the log.
#pragma once

#include <optional>
#include <string>

#include "base/plist.h"

namespace tavrel {

/// The text of a UUID that is given as 16 bytes or as text; nothing for any other value.
std::optional<std::string> appUuidFrom(const plist::Value& value);

/// The entries of the log from the elements of "app_data", in their order. An element that is no
/// dictionary or lacks its identifier, its version or its UUID (16 bytes, or their text) is left
/// out; a missing number reads as 0.
plist::Array appInfoFrom(const plist::Array& appData);

}  // namespace tavrel
