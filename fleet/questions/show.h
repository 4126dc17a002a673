// The question about one statistic: how it is distributed over the devices, or what all its values
// amount to; as a whole, divided by an attribute of the logs, or next to other days or versions.
#pragma once

#include <array>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "fleet/engine/engine.h"
#include "fleet/questions/grouping.h"
#include "fleet/questions/histogram.h"
#include "fleet/questions/ledger.h"
#include "fleet/questions/log_table.h"
#include "fleet/questions/part_name.h"

namespace tavrel::fleet {

inline constexpr std::array<unsigned, 5> kPercents = {5, 25, 50, 75, 95};

struct ShowRequest {
  std::string key;
  KeyKind kind = KeyKind::Scalar;  // a distribution includes its histogram
  GroupBy by = GroupBy::None;
  DayRange days{};
  /// At most one is set: other days, which must not overlap the first, or a version. With a
  /// version, the first side consists of the logs of all other versions.
  std::optional<DayRange> againstDays{};
  std::optional<std::string> againstVersion{};
  /// Leaves groups of too few devices out of the whole, instead of joining them.
  bool leavesSmallOut = false;
};

/// For a scalar: the values of the logs, one for each day and device.
struct ScalarSpread {
  std::int64_t minimum = 0;
  std::int64_t maximum = 0;
  double mean = 0;                                           // the double nearest to the exact mean
  double squaredDeviations = 0;                              // from the exact mean, rounded once
  std::array<std::int64_t, kPercents.size()> percentiles{};  // by the nearest rank
};

/// For a distribution.
struct MergedAnswer {
  /// Mean and squared deviations cover the logs that have them. They are not-a-number when no log
  /// has, when those that do are of too few devices, or when the count overflows.
  FiveNumbers numbers;
  std::optional<double> deviation;  // the standard deviation; nothing without a mean
  std::size_t logsWithoutMean = 0;  // logs whose mean or deviations are not finite
};

struct HistogramAnswer {
  std::uint64_t values = 0;
  std::vector<Piece> pieces;  // empty when there is none to show
  bool isJoined = false;      // whether buckets were joined because they had too few devices
  /// For a distribution: the intervals that contain the percentiles.
  std::vector<Interval> percentiles;
};

/// The answer for one set of logs.
struct ShownSet {
  PartName name;
  std::size_t logs = 0;
  std::size_t devices = 0;  // the largest number of its logs on one day
  std::optional<ScalarSpread> scalar;
  std::optional<MergedAnswer> merged;
  HistogramAnswer histogram;
};

struct ShowSide {
  std::string title;     // days, "version X" or "all other versions"
  bool isShown = false;  // when false, it has too few devices, and the rest is empty
  ShownSet whole;
  std::vector<ShownSet> groups;
  std::size_t joined = 0;  // groups that are shown as one
};

struct ShowAnswer {
  ShowRequest request;
  std::size_t devicesAtLeast = 0;
  std::vector<ShowSide> sides;  // one, or two with `against`
};

/// Throws EngineError. `request.days` must not overlap `request.againstDays`.
ShowAnswer show(Engine& engine, Ledger& ledger, const ShowRequest& request);

}  // namespace tavrel::fleet
