#include "tools/page/recorded_days.h"

#include <algorithm>
#include <cmath>

#include "base/arithmetic.h"
#include "platform/platform.h"
#include "tools/stat/recorded.h"

namespace tavrel {
namespace {

// How many values of one distribution are sorted in memory.
constexpr std::size_t kSortedValues = 1U << 20;

DayValues summedUp(std::vector<double>& values, const Summary& summary) {
  DayValues day;
  if (values.size() > kSortedValues || !summary.hasFinite()) return day;
  RoundHistogram histogram(summary);
  for (const double value : values)
    histogram.add(value);
  day.buckets = histogram.buckets();
  std::erase_if(values, [](double value) { return std::isnan(value); });
  const auto middle = values.begin() + static_cast<std::ptrdiff_t>((values.size() - 1) / 2);
  std::nth_element(values.begin(), middle, values.end());
  day.median = *middle;
  return day;
}

// The last day that has statistics; nothing when none has.
std::optional<std::int32_t> latestDay(const RecordedDays& recorded) {
  std::optional<std::int32_t> latest;
  const auto look = [&](const auto& statistics) {
    for (const auto& [key, statistic] : statistics)
      latest = std::max(latest.value_or(kFirstDay), statistic.days.back().first);
  };
  look(recorded.scalars);
  look(recorded.distributions);
  return latest;
}

class Reader {
 public:
  explicit Reader(ToolContext& context, std::int32_t days) : context_(context), days_(days) {}

  /// Reads the days up to `last`. Returns what they were read from.
  Expected<RecordedHistory> readDays(std::int32_t last) {
    recorded_.first = lowInt32(std::max(std::int64_t{last} - days_ + 1, std::int64_t{kFirstDay}));
    recorded_.last = last;
    recorded_.day = last;
    auto history =
        openRecorded(context_, {.key = "", .firstDay = recorded_.first, .lastDay = last});
    if (!history) return history;
    Status read = history->walkScalars(
        [&](std::string_view key, std::int32_t day, std::int64_t value, bool&) {
          entryOf(recorded_.scalars, key).days.emplace_back(day, value);
        });
    if (!read) return read.error();
    read = history->walkDistributions([&](std::string_view key, std::int32_t day, std::int64_t,
                                          BHHistoryDistributionEnumerator& enumerator, bool&) {
      Summary summary;
      double value = 0;
      std::uint32_t seconds = 0;
      while (enumerator.getNextValue(value, seconds))
        summary.add(value);
      if (!enumerator.failed())
        entryOf(recorded_.distributions, key).days.emplace_back(day, summary);
    });
    if (!read) return read.error();
    return history;
  }

  /// Reads up to yesterday or, when that finds nothing, up to the last day that has any.
  Status readLatest() {
    const std::int32_t today = context_.platform().statistics->BHDaysSince1970();
    auto history = readDays(previousDay(today));
    // The store does not know of days whose values wait; today's do.
    if (history && !latestDay(recorded_)) history = readDays(today);
    if (history && !latestDay(recorded_)) {
      const auto held = history->daysHeld();
      if (!held) return held.error();
      // A day in the future stems from a clock that was wrong.
      history = readDays(*held ? std::min((*held)->last, today) : previousDay(today));
    }
    recorded_.day = latestDay(recorded_).value_or(recorded_.last);
    return history ? Status(Done{}) : history.error();
  }

  /// Reads the values of the day that is shown.
  Status readDay() {
    auto history =
        openRecorded(context_, {.key = "", .firstDay = recorded_.day, .lastDay = recorded_.day});
    if (!history) return history.error();
    std::vector<double> values;
    return history->walkDistributions([&](std::string_view key, std::int32_t, std::int64_t,
                                          BHHistoryDistributionEnumerator& enumerator, bool&) {
      Summary summary;
      values.clear();
      double value = 0;
      std::uint32_t seconds = 0;
      while (enumerator.getNextValue(value, seconds)) {
        summary.add(value);
        if (values.size() <= kSortedValues) values.push_back(value);
      }
      if (enumerator.failed()) return;
      RecordedDistribution& distribution = entryOf(recorded_.distributions, key);
      // Include what was recorded since the first pass.
      auto& byDay = distribution.days;
      if (!byDay.empty() && byDay.back().first == recorded_.day) byDay.pop_back();
      byDay.emplace_back(recorded_.day, summary);
      distribution.values = summedUp(values, summary);
    });
  }

  RecordedDays take(std::string fault) {
    recorded_.fault = std::move(fault);
    return std::move(recorded_);
  }

 private:
  template <class Statistics>
  static typename Statistics::mapped_type& entryOf(Statistics& statistics, std::string_view key) {
    const auto known = statistics.find(key);
    return known != statistics.end() ? known->second : statistics[std::string(key)];
  }

  ToolContext& context_;
  std::int32_t days_;
  RecordedDays recorded_;
};

}  // namespace

RecordedDays readRecordedDays(ToolContext& context, std::optional<std::int32_t> day,
                              std::int32_t days) {
  Reader reader(context, days);
  Status read = Done{};
  if (!day) {
    read = reader.readLatest();
  } else if (const auto history = reader.readDays(*day); !history) {
    read = history.error();
  }
  if (const Status values = reader.readDay(); read && !values) read = values;
  return reader.take(read ? std::string() : read.error().message);
}

}  // namespace tavrel
