// What the fleet consists of.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "fleet/engine/engine.h"
#include "fleet/questions/grouping.h"
#include "fleet/questions/ledger.h"
#include "fleet/questions/part_name.h"

namespace tavrel::fleet {

struct CountedGroup {
  PartName name;
  std::size_t logs = 0;
  std::size_t devices = 0;    // the largest number of its logs on one day
  std::int32_t firstDay = 0;  // the first day with enough devices
  std::int32_t lastDay = 0;
};

struct SummaryPart {
  GroupBy by = GroupBy::None;
  std::vector<CountedGroup> groups;  // empty when the logs cannot be divided by this attribute
  std::size_t joined = 0;            // groups that are shown as one
};

struct SummaryAnswer {
  std::size_t devicesAtLeast = 0;
  DayRange days;         // the days asked for
  bool isShown = false;  // when false, there are too few devices, and the rest is empty
  CountedGroup whole;
  std::vector<SummaryPart> parts;  // by version, region, whitelist and day
  std::vector<Key> keys;           // the statistics that have enough devices
  std::size_t scalarKeys = 0;
  std::size_t distributionKeys = 0;
  std::size_t histogramKeys = 0;
};

/// Whether enough devices have the statistic in these logs. Reads no more rows than that takes.
/// Throws EngineError.
bool hasEnough(Engine& engine, const Ledger& ledger, const LogSet& among, const Key& key);

/// The statistics that enough devices have in these logs. Throws EngineError.
std::vector<Key> shownKeys(Engine& engine, const Ledger& ledger, const LogSet& among);

/// What happens to logs of versions that have too few devices.
enum class SmallVersions : std::uint8_t { Joined, LeftOut };

/// Throws EngineError.
SummaryAnswer summarise(Engine& engine, Ledger& ledger, const DayRange& days,
                        SmallVersions small = SmallVersions::Joined);

}  // namespace tavrel::fleet
