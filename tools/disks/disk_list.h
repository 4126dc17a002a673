// The device's drives, with what is known about their health.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>
#include <vector>

#include "base/expected.h"
#include "platform/linux/health/reading.h"
#include "platform/linux/health/verdict.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

struct Disk {
  health::Reading reading;
  health::Verdict verdict;
  std::optional<std::int64_t> age;  // seconds since it was read; nothing when it never was
};

struct DiskList {
  std::vector<Disk> disks;    // by kind
  std::vector<Error> faults;  // for files that are not readings, and for the search for drives
};

/// Every drive of the machine, plus drives that only have a reading.
DiskList findDisks(ToolContext& context);

struct Wear {
  std::string_view figure;
  std::int64_t percent = 0;
};

/// The largest figure of a drive's wear; nothing when it reports none.
std::optional<Wear> wearOf(const Disk& disk);

}  // namespace tavrel
