// Samples this machine into statistics.
#pragma once

#include <chrono>
#include <cstdint>
#include <string_view>

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

/// Reads the machine now and once a second for `seconds`, and keeps what it read in the statistics
/// of the day of each reading. Readings are kept once a minute and at the end.
void collectStatistics(ToolContext& context, std::uint32_t seconds, CollectPace& pace);

/// The same by this machine's clock, until SIGINT or SIGTERM comes.
void collectStatistics(ToolContext& context, std::uint32_t seconds);

/// The keys that are recorded, with their units, for people.
std::string_view collectedKeysHelp();

}  // namespace tavrel
