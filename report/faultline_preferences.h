// The two preference functions of a dynamically loaded library.
#pragma once

#include "platform/platform.h"

namespace tavrel {

/// Looks up those of the two functions that `ProcessState` does not hold yet. False when one is
/// missing; the system log then says which.
bool findFaultlinePreferences(Platform& platform);

}  // namespace tavrel
