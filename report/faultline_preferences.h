// The two preference functions that are looked up in a dynamically loaded library.
#pragma once

#include "platform/platform.h"

namespace tavrel {

/// Looks up what is still unknown of the two functions in `ProcessState`. False when either is
/// missing; the system log then says which.
bool findFaultlinePreferences(Platform& platform);

}  // namespace tavrel
