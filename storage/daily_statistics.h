// The daily storage statistics run.
#pragma once

#include "platform/platform.h"
#include "platform/step_observer.h"

namespace tavrel {

/// Files the state of the flash storage as scalars of today: disk usage, the NAND information, and
/// every simple report channel of the storage category. Has the structured storage log written and
/// files pending ECC events as structured records. Its steps fail one by one; `onStep` hears of
/// each.
void dailyStorageStatistics(Platform& platform, const StepObserver& onStep = {});

}  // namespace tavrel
