#include <algorithm>
#include <cmath>
#include <iterator>

#include "base/civil_time.h"
#include "platform/platform.h"
#include "tools/export/exports.h"
#include "tools/stat/recorded.h"
#include "tools/stat/value_summary.h"

namespace tavrel {
namespace {

const MetricFamily kDay{"tavrel_statistics_day_timestamp_seconds", "seconds",
                        "Beginning of the day of the statistics, UTC."};
const MetricFamily kScalar{"tavrel_scalar", "", "Scalars of the day."};
const MetricFamily kDistribution{"tavrel_distribution", "",
                                 "Distributions of the day: how many values, and what they are."};
const MetricFamily kValues{"tavrel_distribution_values", "",
                           "How many values a distribution of the day with a negative one has."};
const MetricFamily kMinimum{"tavrel_distribution_minimum", "",
                            "Smallest value of a distribution of the day."};
const MetricFamily kMaximum{"tavrel_distribution_maximum", "",
                            "Largest value of a distribution of the day."};
const MetricFamily kMean{"tavrel_distribution_mean", "",
                         "Mean of the values of a distribution of the day."};

constexpr int kPercents[] = {5, 25, 50, 75, 95, 99};

// Distributions of up to this many values are sorted in memory. For longer ones, four more passes
// search for the percentiles.
constexpr std::size_t kSortedValues = 1U << 20;

class DistributionExport {
 public:
  DistributionExport(ToolContext& context, std::int32_t day, MetricPage& page)
      : context_(context), day_(day), page_(page) {}

  void take(std::string_view key, BHHistoryDistributionEnumerator& enumerator) {
    Summary summary;
    values_.clear();
    double sum = 0;
    double value = 0;
    std::uint32_t seconds = 0;
    while (enumerator.getNextValue(value, seconds)) {
      summary.add(value);
      if (std::isnan(value)) continue;
      sum += value;
      if (values_.size() <= kSortedValues) values_.push_back(value);
    }
    if (enumerator.failed()) return;
    const MetricLabels labels{{"key", std::string(key)}};
    const std::int64_t count = summary.numbers();
    if (count > 0) {
      page_.gauge(kMinimum, labels, summary.minimum());
      page_.gauge(kMaximum, labels, summary.maximum());
      page_.gauge(kMean, labels, summary.mean());
    }
    // In a summary, neither the sum nor a quantile may be negative.
    if (count > 0 && summary.minimum() < 0) return page_.gauge(kValues, labels, count);
    SummaryPoint point{static_cast<std::uint64_t>(count), sum, {}};
    if (count > 0) point.quantiles = quantilesOf(key, count);
    page_.summary(kDistribution, labels, point);
  }

 private:
  std::vector<std::pair<double, double>> quantilesOf(std::string_view key, std::int64_t numbers) {
    std::vector<double> found;
    if (values_.size() <= kSortedValues) {
      std::ranges::sort(values_);
      for (const int percent : kPercents) {
        const std::int64_t rank = std::max<std::int64_t>((numbers * percent + 99) / 100, 1);
        found.push_back(values_[static_cast<std::size_t>(rank - 1)]);
      }
    } else {
      found = search(key, numbers);
    }
    std::vector<std::pair<double, double>> quantiles;
    for (std::size_t i = 0; i < found.size(); ++i)
      quantiles.emplace_back(kPercents[i] / 100.0, found[i]);
    return quantiles;
  }

  // Values added since the summary shift the ranks a little.
  std::vector<double> search(std::string_view key, std::int64_t numbers) {
    auto history = openRecorded(
        context_, {.key = std::string(key), .isPrefix = false, .firstDay = day_, .lastDay = day_});
    if (!history) return {};
    PercentileSearch search(numbers, kPercents);
    while (search.needsPass()) {
      const Status read =
          history->walkDistributions([&](std::string_view, std::int32_t, std::int64_t,
                                         BHHistoryDistributionEnumerator& enumerator, bool&) {
            double value = 0;
            std::uint32_t seconds = 0;
            while (enumerator.getNextValue(value, seconds))
              search.add(value);
          });
      if (!read) return {};
      search.endPass();
    }
    return search.values();
  }

  ToolContext& context_;
  std::int32_t day_;
  MetricPage& page_;
  std::vector<double> values_;
};

// The last day in the store: what waits to be folded need not be read for it.
std::optional<std::int32_t> latestDay(ToolContext& context) {
  const auto history = context.storeForReading().openHistory();
  const auto held = history ? (*history)->daysHeld() : history.error();
  if (!held) {
    context.fail(held.error().message);
    return std::nullopt;
  }
  if (!*held) return std::nullopt;
  // A day in the future stems from a clock that was wrong.
  return std::min((*held)->last, context.platform().statistics->BHDaysSince1970());
}

}  // namespace

void exportStatistics(ToolContext& context, std::optional<std::int32_t> day, MetricPage& page) {
  if (!day) day = latestDay(context);
  if (!day) return;
  auto history = openRecorded(context, {.key = "", .firstDay = *day, .lastDay = *day});
  if (!history) return context.fail(history.error().message);
  page.gauge(kDay, {}, std::int64_t{*day} * kSecondsPerDay);
  Status read =
      history->walkScalars([&](std::string_view key, std::int32_t, std::int64_t value, bool&) {
        page.gauge(kScalar, {{"key", std::string(key)}}, value);
      });
  if (!read) return context.fail(read.error().message);
  DistributionExport distributions(context, *day, page);
  read = history->walkDistributions([&](std::string_view key, std::int32_t, std::int64_t,
                                        BHHistoryDistributionEnumerator& values,
                                        bool&) { distributions.take(key, values); });
  if (!read) context.fail(read.error().message);
}

}  // namespace tavrel
