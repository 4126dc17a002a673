// Waits for changes in a folder that need not exist yet.
#pragma once

#include <functional>
#include <string>

#include "base/expected.h"

namespace tavrel {

/// Calls `look` at once and after every change in the folder, until SIGINT or SIGTERM comes or
/// `look` answers false. What happens while it looks is seen by the next look.
Status watchFolder(const std::string& folder, const std::function<bool()>& look);

}  // namespace tavrel
