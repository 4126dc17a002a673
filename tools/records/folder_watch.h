// Waits for changes in a folder, which need not exist yet.
#pragma once

#include <functional>
#include <string>

#include "base/expected.h"

namespace tavrel {

/// Calls `look` at once and after each change in the folder, until SIGINT or SIGTERM arrives or
/// `look` returns false. A change during a call leads to another call.
Status watchFolder(const std::string& folder, const std::function<bool()>& look);

}  // namespace tavrel
