#include "tools/page/recorded_days.h"

#include <algorithm>
#include <cmath>

#include "base/arithmetic.h"
#include "platform/platform.h"
#include "tools/stat/recorded.h"

namespace tavrel {
namespace {

// Of one distribution, in memory.
constexpr std::size_t kSortedValues = 1U << 20;

std::int32_t daysBefore(std::int32_t day, std::int32_t days) {
  return lowInt32(std::max(std::int64_t{day} - days, std::int64_t{kFirstDay}));
}

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

// The last day that the range has; without any the day at its end.
std::int32_t latestDay(const RecordedDays& recorded) {
  std::optional<std::int32_t> latest;
  const auto look = [&](const auto& statistics) {
    for (const auto& [key, statistic] : statistics)
      latest = std::max(latest.value_or(kFirstDay), statistic.days.rbegin()->first);
  };
  look(recorded.scalars);
  look(recorded.distributions);
  return latest.value_or(recorded.last);
}

Expected<std::int32_t> lastDayOfRange(ToolContext& context, std::int32_t days) {
  const std::int32_t today = context.platform().statistics->BHDaysSince1970();
  const std::int32_t yesterday = previousDay(today);
  auto history = openRecorded(context, {.key = "", .hasValues = false});
  const auto held = history ? history->daysHeld() : history.error();
  if (!held) return held.error();
  if (!*held) return yesterday;
  // A day that has not come is of a clock that was wrong.
  if ((*held)->first > yesterday) return std::min((*held)->last, today);
  return (*held)->last <= daysBefore(yesterday, days) ? (*held)->last : yesterday;
}

class Reader {
 public:
  Reader(ToolContext& context, RecordedDays& recorded) : context_(context), recorded_(recorded) {}

  Status readAll() {
    auto history =
        openRecorded(context_, {.key = "", .firstDay = recorded_.first, .lastDay = recorded_.last});
    if (!history) return history.error();
    const Status read =
        history->walkScalars([&](std::string_view key, std::int32_t day, std::int64_t value,
                                 bool&) { entryOf(recorded_.scalars, key).days[day] = value; });
    if (!read) return read;
    return history->walkDistributions([&](std::string_view key, std::int32_t day, std::int64_t,
                                          BHHistoryDistributionEnumerator& enumerator, bool&) {
      Summary summary;
      double value = 0;
      std::uint32_t seconds = 0;
      while (enumerator.getNextValue(value, seconds))
        summary.add(value);
      if (!enumerator.failed()) entryOf(recorded_.distributions, key).days[day] = summary;
    });
  }

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
      // What was recorded since the first look counts as well.
      distribution.days[recorded_.day] = summary;
      distribution.values = summedUp(values, summary);
    });
  }

 private:
  template <class Statistics>
  static typename Statistics::mapped_type& entryOf(Statistics& statistics, std::string_view key) {
    const auto known = statistics.find(key);
    return known != statistics.end() ? known->second : statistics[std::string(key)];
  }

  ToolContext& context_;
  RecordedDays& recorded_;
};

}  // namespace

RecordedDays readRecordedDays(ToolContext& context, std::optional<std::int32_t> day,
                              std::int32_t days) {
  RecordedDays recorded;
  const auto last = day ? Expected<std::int32_t>(*day) : lastDayOfRange(context, days);
  const std::int32_t today = context.platform().statistics->BHDaysSince1970();
  recorded.last = last ? *last : previousDay(today);
  recorded.first = daysBefore(recorded.last, days - 1);
  recorded.day = recorded.last;
  if (!last) {
    recorded.fault = last.error().message;
    return recorded;
  }
  Reader reader(context, recorded);
  const Status read = reader.readAll();
  if (!day) recorded.day = latestDay(recorded);
  const Status readDay = reader.readDay();
  if (!read) recorded.fault = read.error().message;
  if (read && !readDay) recorded.fault = readDay.error().message;
  return recorded;
}

}  // namespace tavrel
