// The two preference functions of a dynamically loaded library.
#pragma once

#include "platform/platform.h"

namespace tavrel {

/// Loads those of the two functions that `ProcessState` does not have yet. False when one is
/// missing; the system log then says which.
bool findFaultlinePreferences(Platform& platform);

}  // namespace tavrel
