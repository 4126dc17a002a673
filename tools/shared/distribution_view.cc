#include "tools/shared/distribution_view.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <limits>

#include "platform/tallied_log.h"
#include "tools/console/table.h"

namespace tavrel {
namespace {

// The ends of a bucket, from a label such as "(-inf, 10]". Any other label is sorted last.
std::pair<double, double> endsOf(std::string_view label) {
  constexpr double kLast = std::numeric_limits<double>::infinity();
  const auto read = [](std::string_view text) {
    double value = kLast;
    std::from_chars(text.data(), text.data() + text.size(), value);
    if (std::isnan(value)) value = kLast;
    return value;
  };
  const std::size_t comma = label.find(", ");
  if (!label.starts_with('(') || comma == std::string_view::npos) return {kLast, kLast};
  return {read(label.substr(1, comma - 1)), read(label.substr(comma + 2))};
}

std::vector<DistributionView::Bucket> bucketsOf(const plist::Dictionary& histogram) {
  std::vector<DistributionView::Bucket> buckets;
  for (const plist::Entry& entry : histogram) {
    const auto count = entry.value.number();
    if (!count || count->real() < 0) continue;
    buckets.push_back({std::string(entry.key.view()), static_cast<std::uint64_t>(count->int64())});
  }
  std::stable_sort(buckets.begin(), buckets.end(),
                   [](const auto& a, const auto& b) { return endsOf(a.label) < endsOf(b.label); });
  return buckets;
}

}  // namespace

std::optional<double> DistributionView::standardDeviation() const {
  if (count <= 0) return std::nullopt;
  return std::sqrt(squaredDeviations / static_cast<double>(count));
}

void printBuckets(const Page& page, std::span<const DistributionView::Bucket> buckets) {
  std::uint64_t largest = 0;
  for (const auto& bucket : buckets)
    largest = std::max(largest, bucket.count);
  Table table({{"", Table::Align::Whole}, {"", Table::Align::Right}, {"", Table::Align::Bar}}, 2);
  for (const auto& bucket : buckets) {
    table.add({bucket.label, std::to_string(bucket.count),
               Table::Cell::bar(static_cast<double>(bucket.count), static_cast<double>(largest))});
  }
  table.print(page);
}

bool isSummary(const plist::Value& entry) {
  const plist::Array summary = entry.array();
  return summary.size() == 5 &&
         std::all_of(summary.begin(), summary.end(), [](const auto& v) { return v.number(); });
}

std::vector<DistributionView> distributionsOf(const plist::Dictionary& log) {
  const plist::Dictionary summaries = log.dictionary(kDistributionsMember);
  const plist::Dictionary histograms = log.dictionary(kHistogramsMember);
  std::vector<DistributionView> views;
  for (const plist::Entry& entry : summaries) {
    const plist::Array summary = entry.value.array();
    const auto numberAt = [&](std::size_t index) { return summary.at(index).number(); };
    if (!isSummary(entry.value)) continue;
    views.push_back({std::string(entry.key.view()), numberAt(0)->real(), numberAt(1)->real(),
                     numberAt(2)->real(), numberAt(3)->real(), numberAt(4)->int64(),
                     bucketsOf(histograms.dictionary(entry.key))});
  }
  std::sort(views.begin(), views.end(), [](const auto& a, const auto& b) { return a.key < b.key; });
  return views;
}

}  // namespace tavrel
