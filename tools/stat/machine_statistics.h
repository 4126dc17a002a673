// Which statistics are recorded from a reading of the machine, and how they are kept.
#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string_view>

#include "tools/stat/collect_sources.h"

namespace tavrel {

enum class Keeping : std::uint8_t {
  Latest,  // a scalar, replaced by each reading
  Sum,     // a scalar, increased by what happened since the previous reading
  Series,  // a distribution, appended to by each reading
};

// Computes one statistic from a reading and the previous one, which is null for the first. Nothing
// when the statistic is unknown.
using Measure = std::optional<double> (*)(const MachineReading& now, const MachineReading* before,
                                          double secondsBetween);

struct MachineStatistic {
  const char* key;
  Keeping keeping;
  Measure measure;
};

/// One row per statistic. docs/collect.md describes each.
std::span<const MachineStatistic> machineStatistics();

/// The keys that are recorded, with their units, for people.
std::string_view collectedKeysHelp();

}  // namespace tavrel
