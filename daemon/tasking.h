// Tracking of OS updates, and remote tasking: preference settings that another component schedules,
// and that are undone when the tasking or the OS changes.
#pragma once

#include <cstdint>

#include "platform/platform.h"

namespace tavrel {

/// What a run does with the scheduled tasking.
enum class TaskingChange : std::uint8_t {
  None,     // nothing is scheduled, or it is already applied
  Apply,    // nothing is applied yet
  Replace,  // the applied tasking is undone first
  Refuse,   // preferences could not store it
};

/// The change that a run would make now. Changes nothing.
TaskingChange nextTaskingChange(Platform& platform);

/// Notes an OS update, applies a changed tasking, and submits logs at once for a number of days
/// after an OS update. Refuses, with a line in the system log, a tasking that preferences could not
/// store; the one applied before stays.
///
/// The daemon's own domain, which records what was applied, is synchronised last, so that after an
/// interruption the next run repeats all of it.
void trackOSChangeAndTasking(Platform& platform);

}  // namespace tavrel
