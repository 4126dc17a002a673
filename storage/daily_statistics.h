// The daily storage statistics run.
#pragma once

#include "platform/platform.h"
#include "platform/step_observer.h"

namespace tavrel {

/// Records the state of the flash storage as today's scalars: disk usage, the NAND information, and
/// every simple report channel of the storage category. Also writes the structured storage log and
/// files pending ECC events as structured records. A failed step does not stop the others. Calls
/// `onStep` for each step.
void dailyStorageStatistics(Platform& platform, const StepObserver& onStep = {});

}  // namespace tavrel
