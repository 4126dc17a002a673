// What a device recorded over some days, by key.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "tools/shared/distribution_view.h"
#include "tools/shared/tool_context.h"
#include "tools/stat/value_summary.h"

namespace tavrel {

/// A distribution's values on the day that is shown.
struct DayValues {
  std::optional<double> median;  // nothing when there are too many values to sort
  std::vector<DistributionView::Bucket> buckets;
};

/// Values by day, ascending.
template <class Value>
using ByDay = std::vector<std::pair<std::int32_t, Value>>;

struct RecordedScalar {
  ByDay<std::int64_t> days;
};
struct RecordedDistribution {
  ByDay<Summary> days;
  DayValues values;
};

struct RecordedDays {
  std::int32_t first = 0;
  std::int32_t last = 0;  // included
  std::int32_t day = 0;   // the day whose figures are shown
  std::map<std::string, RecordedScalar, std::less<>> scalars;
  std::map<std::string, RecordedDistribution, std::less<>> distributions;
  std::string fault;  // why something may be missing; empty when nothing is

  /// The value on the day that is shown, which is the last one possible; null without a value.
  template <class Value>
  const Value* ofDay(const ByDay<Value>& days) const {
    return !days.empty() && days.back().first == day ? &days.back().second : nullptr;
  }
};

/// Reads `days` days up to `day`. Without it, up to yesterday or, when that finds nothing, up to
/// the last day that has any; the day that is shown is then the last one with statistics.
RecordedDays readRecordedDays(ToolContext& context, std::optional<std::int32_t> day,
                              std::int32_t days);

}  // namespace tavrel
