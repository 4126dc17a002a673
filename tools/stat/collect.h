// Samples this machine and records the results as statistics.
#pragma once

#include <chrono>
#include <cstdint>
#include <string>

#include "tools/shared/tool_context.h"

namespace tavrel {

/// Decides when readings are taken.
class CollectPace {
 public:
  using Ticks = std::chrono::steady_clock::time_point;

  virtual ~CollectPace() = default;
  virtual Ticks now() = 0;
  virtual std::chrono::system_clock::time_point wallTime() {
    return std::chrono::system_clock::now();
  }
  /// Waits until `end`. Returns true, without waiting any longer, when the readings must end early.
  virtual bool endsBefore(Ticks end) = 0;
};

/// Reads the machine now and once a second for `seconds`, and records each reading
/// under its day. Without a folder for recording in memory, readings go into the store
/// once a minute and at the end.
void collectStatistics(ToolContext& context, std::uint32_t seconds, CollectPace& pace);

/// The same, timed by this machine's clock, until SIGINT or SIGTERM arrives.
void collectStatistics(ToolContext& context, std::uint32_t seconds);

/// Reads the machine once. Rates and sums span the time since the previous such run, whose reading
/// is in `stateFile`; an empty name stands for the device's own file.
void collectOnce(ToolContext& context, const std::string& stateFile);

/// Does the same now and once every `period`, until `pace` ends it or values cannot be kept.
/// Without a folder for recording in memory, says so, collects readings for the store for up to an
/// hour (two while the store takes none), and ends with a failure when there is one.
void collectEvery(ToolContext& context, std::chrono::seconds period, const std::string& stateFile,
                  CollectPace& pace);

/// The same, timed by this machine's clock, until SIGINT or SIGTERM arrives.
void collectEvery(ToolContext& context, std::chrono::seconds period, const std::string& stateFile);

}  // namespace tavrel
