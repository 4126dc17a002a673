// Tracking of OS updates, and remote tasking: preference settings that another component schedules
// and that are undone when the tasking or the OS changes.
#pragma once

#include "platform/platform.h"

namespace tavrel {

/// Notes an OS update, applies a changed tasking, and submits logs at once for a number of days
/// after an OS update. Refuses a tasking that preferences could not remember, with a line in the
/// system log; the one applied before stays.
///
/// The daemon's own domain, which remembers what was applied, is synchronised last, so that the
/// next run repeats a run that was cut short as a whole.
void trackOSChangeAndTasking(Platform& platform);

}  // namespace tavrel
