// The list of activated applications, from a client's message to the log.
#pragma once

#include <optional>
#include <string>

#include "base/plist.h"

namespace tavrel {

/// The 36 characters of a UUID, in upper case, from its 16 bytes or its text.
std::optional<std::string> uuidText(const plist::Value& uuid);

/// The entries of the log from the elements of "app_data", in their order. An element that is no
/// dictionary or lacks its identifier, version or UUID is left out; a missing number reads as 0.
plist::Array appInfoFrom(const plist::Array& appData);

}  // namespace tavrel
