// The list of activated applications, from a client's message to the log.
#pragma once

#include "base/plist.h"

namespace tavrel {

/// Makes the log's entries from the elements of "app_data", in their order. Leaves out an element
/// that is not a dictionary or lacks its identifier, its version or its UUID (16 bytes, or their
/// text). A missing number reads as 0.
plist::Array appInfoFrom(const plist::Array& appData);

}  // namespace tavrel
