// The daily storage statistics run.
#pragma once

#include "platform/platform.h"

namespace tavrel {

/// Files the state of the flash storage as scalars of today: disk usage, the NAND information, and
/// every simple report channel of the storage category. Has the structured storage log written and
/// files pending ECC events as structured records. Its parts fail one by one.
void dailyStorageStatistics(Platform& platform);

}  // namespace tavrel
