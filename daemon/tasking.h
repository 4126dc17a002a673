// Tracking of OS updates, and remote tasking: preference settings that another component schedules
// and that are undone when the tasking or the OS changes.
#pragma once

#include <cstdint>

#include "platform/platform.h"

namespace tavrel {

/// What a run does with the scheduled tasking.
enum class TaskingChange : std::uint8_t {
  None,     // nothing is scheduled, or it is applied already
  Apply,    // nothing is applied yet
  Replace,  // what is applied is undone first
  Refuse,   // preferences could not remember it
};

/// What a run would do now. Changes nothing.
TaskingChange nextTaskingChange(Platform& platform);

/// Notes an OS update, applies a changed tasking, and submits logs at once for a number of days
/// after an OS update. Refuses a tasking that preferences could not remember, with a line in the
/// system log; the one applied before stays.
///
/// The daemon's own domain, which remembers what was applied, is synchronised last, so that the
/// next run repeats a run that was cut short as a whole.
void trackOSChangeAndTasking(Platform& platform);

}  // namespace tavrel
