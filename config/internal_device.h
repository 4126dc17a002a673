// Whether this is an internal device.
#pragma once

#include "platform/platform.h"

namespace tavrel {

/// The answer to the device query "InternalBuild", asked once per process.
bool BHIsInternalDevice(Platform& platform);

}  // namespace tavrel
