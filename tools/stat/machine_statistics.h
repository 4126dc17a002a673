// What is recorded of a reading of the machine, and how it is kept.
#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string_view>

#include "tools/stat/collect_sources.h"

namespace tavrel {

enum class Keeping : std::uint8_t {
  Latest,  // a scalar, replaced by each reading
  Sum,     // a scalar, added to by what happened since the reading before
  Series,  // a distribution, appended to by each reading
};

// Computes one statistic from a reading and the one before, which is null for the first. Nothing
// when it is unknown.
using Measure = std::optional<double> (*)(const MachineReading& now, const MachineReading* before,
                                          double secondsBetween);

struct MachineStatistic {
  const char* key;
  Keeping keeping;
  Measure measure;
};

/// One row per statistic. docs/collect.md says what each is.
std::span<const MachineStatistic> machineStatistics();

/// The keys that are recorded, with their units, for people.
std::string_view collectedKeysHelp();

}  // namespace tavrel
