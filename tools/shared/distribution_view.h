// The distributions and histograms of a tallied log, read back; histograms as bars.
#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "base/plist.h"
#include "tools/console/page.h"

namespace tavrel {

struct DistributionView {
  struct Bucket {
    std::string label;
    std::uint64_t count = 0;
  };

  std::string key;
  double minimum = 0;
  double maximum = 0;
  double mean = 0;
  double squaredDeviations = 0;  // sum of squared deviations from the mean
  std::int64_t count = 0;
  std::vector<Bucket> buckets;  // of the histogram, ascending; empty without one

  /// The root of the mean squared deviation; nothing when the count is 0.
  std::optional<double> standardDeviation() const;
};

/// One line per bucket: label, count, and a bar proportional to the largest count.
void printBuckets(const Page& page, std::span<const DistributionView::Bucket> buckets);

/// Whether an entry of "BHDistributions" is a summary: minimum, maximum, mean, squared deviations,
/// count.
bool isSummary(const plist::Value& entry);

/// The distributions of a log, ordered by key. Skips entries that are not a summary.
std::vector<DistributionView> distributionsOf(const plist::Dictionary& log);

}  // namespace tavrel
