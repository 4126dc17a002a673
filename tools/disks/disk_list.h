// The device's drives, with what is known about their health.
#pragma once

#include <cstdint>
#include <vector>

#include "base/expected.h"
#include "platform/linux/health/reading.h"
#include "platform/linux/health/verdict.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

struct Disk {
  health::Reading reading;
  health::Verdict verdict;
  std::int64_t age = 0;  // seconds
};

struct DiskList {
  std::vector<Disk> disks;    // by kind
  std::vector<Error> faults;  // for files that are not readings, and for the search for drives
};

/// Every drive of the machine, plus drives that only have a reading.
DiskList findDisks(ToolContext& context);

}  // namespace tavrel
