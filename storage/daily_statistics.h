// The daily storage statistics run.
#pragma once

#include "platform/platform.h"
#include "platform/step_observer.h"

namespace tavrel {

/// Files the state of the flash storage as scalars of today: disk usage, the NAND information, and
/// every simple report channel of the storage category. Also writes the structured storage log and
/// files pending ECC events as structured records. A step that fails does not stop the others.
/// Calls `onStep` for each.
void dailyStorageStatistics(Platform& platform, const StepObserver& onStep = {});

}  // namespace tavrel
