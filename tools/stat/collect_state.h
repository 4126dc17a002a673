// The reading that a run of `stat collect --once` leaves for the next one, so that rates and sums
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
  /// CLOCK_MONOTONIC, which starts at zero when the machine does.
  std::chrono::nanoseconds at{};
  /// Only the counters of the reading are kept.
  MachineReading machine;
  /// The fractional parts that sums have left over, by key.
  std::map<std::string, double> remainders;
};

/// Nothing when there is no file, or when its reading is from another boot, from the future or
/// older than a day. An error when `writeCollectState` did not write the file.
Expected<std::optional<CollectState>> readCollectState(const std::string& path,
                                                       const std::string& boot,
                                                       std::chrono::nanoseconds now);

Status writeCollectState(const std::string& path, const std::string& boot,
                         const CollectState& state);

}  // namespace tavrel
