// The reading that one run of `stat collect --once` leaves for the next, so that rates and sums
// span the time between the runs.
#pragma once

#include <chrono>
#include <map>
#include <optional>
#include <string>

#include "base/expected.h"
#include "platform/linux/files/device_root.h"
#include "tools/stat/collect_sources.h"

namespace tavrel {

struct CollectState {
  /// CLOCK_MONOTONIC, which starts from zero with the machine.
  std::chrono::nanoseconds at{};
  /// Of the reading only the counters are kept.
  MachineReading machine;
  /// What a sum has left over below one, by key.
  std::map<std::string, double> remainders;
};

/// The start of the machine, as the kernel names it; empty when unknown.
std::string bootIdentity(const DeviceRoot& root);

/// Nothing when there is no file, or when it is of another start of the machine, of the future or
/// older than a day. An error when the file is none that `writeCollectState` wrote.
Expected<std::optional<CollectState>> readCollectState(const std::string& path,
                                                       const std::string& boot,
                                                       std::chrono::nanoseconds now);

Status writeCollectState(const std::string& path, const std::string& boot,
                         const CollectState& state);

}  // namespace tavrel
