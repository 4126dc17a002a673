// Samples this machine into statistics.
#pragma once

#include <chrono>
#include <cstdint>
#include <string>

#include "tools/shared/tool_context.h"

namespace tavrel {

/// When readings are taken.
class CollectPace {
 public:
  using Ticks = std::chrono::steady_clock::time_point;

  virtual ~CollectPace() = default;
  virtual Ticks now() = 0;
  /// Waits until `end`; true, at once, when the readings are to end early.
  virtual bool endsBefore(Ticks end) = 0;
};

/// Reads the machine now and once a second for `seconds`, and records what it read for the day of
/// each reading. Without a folder for recording in memory, readings go into the store once a minute
/// and at the end.
void collectStatistics(ToolContext& context, std::uint32_t seconds, CollectPace& pace);

/// The same by this machine's clock, until SIGINT or SIGTERM comes.
void collectStatistics(ToolContext& context, std::uint32_t seconds);

/// Reads the machine once. Rates and sums span the time since the last such run, whose reading is
/// in `stateFile`; an empty name is the device's own.
void collectOnce(ToolContext& context, const std::string& stateFile);

/// Does the same now and once in each `period`, until the pace ends it or values cannot be kept.
void collectEvery(ToolContext& context, std::chrono::seconds period, const std::string& stateFile,
                  CollectPace& pace);

/// The same by this machine's clock, until SIGINT or SIGTERM comes.
void collectEvery(ToolContext& context, std::chrono::seconds period, const std::string& stateFile);

}  // namespace tavrel
