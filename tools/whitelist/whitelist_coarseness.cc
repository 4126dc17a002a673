#include "tools/whitelist/whitelist_coarseness.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <vector>

#include "base/format.h"
#include "base/limits.h"
#include "config/bh_config.h"
#include "tools/console/value_text.h"

namespace tavrel {
namespace {

/// A 64-bit integer has at most 19 digits.
constexpr std::int64_t kAllFigures = 19;

std::uint32_t widthOf(const plist::Dictionary& options) {
  const auto width = options.number(kBucketIntervalOption);
  return std::max<std::uint32_t>(width ? width->uint32() : 1, 1);
}

// Counts of figures are subtracted in 32 bits: a count near 2^32 drops more figures than
// any value has and leaves 0.
std::int64_t figuresOf(const plist::Dictionary& options) {
  const auto figures = options.number(kSignificantFiguresOption);
  if (!figures) return kAllFigures;
  constexpr std::uint32_t kHalf = 1U << 31;
  if (figures->uint32() > kHalf + kAllFigures) return -1;
  return std::min<std::int64_t>(figures->uint32(), kAllFigures);
}

// The boundaries that divide the histogram; others have no effect.
std::vector<double> boundariesOf(const plist::Dictionary& options) {
  std::vector<double> boundaries;
  const plist::Array intervals = options.array(kIntervalsOption);
  if (!intervals || intervals.size() > limits::kHistogramBoundaries) return boundaries;
  for (const plist::Value& boundary : intervals) {
    const auto number = boundary.number();
    if (!number || std::isnan(number->real())) continue;
    if (boundaries.empty() || number->real() > boundaries.back()) {
      boundaries.push_back(number->real());
    }
  }
  return boundaries;
}

}  // namespace

Coarseness compareRounding(const plist::Dictionary& before, const plist::Dictionary& after) {
  const std::uint32_t oldWidth = widthOf(before);
  const std::uint32_t newWidth = widthOf(after);
  const std::int64_t oldFigures = figuresOf(before);
  const std::int64_t newFigures = figuresOf(after);
  return {newWidth < oldWidth || newFigures > oldFigures,
          newWidth > oldWidth || newFigures < oldFigures};
}

Coarseness compareIntervals(const plist::Dictionary& before, const plist::Dictionary& after) {
  const std::vector<double> oldOnes = boundariesOf(before);
  const std::vector<double> newOnes = boundariesOf(after);
  return {!std::ranges::includes(oldOnes, newOnes), !std::ranges::includes(newOnes, oldOnes)};
}

bool coarsensNoScalar(const plist::Dictionary& options) {
  const auto width = options.number(kBucketIntervalOption);
  const bool isMeant = width && width->uint32() == 1;
  return !isMeant && widthOf(options) == 1 && figuresOf(options) == kAllFigures;
}

std::string optionsText(const plist::Dictionary& options, bool isScalar) {
  if (!isScalar) {
    const plist::Array intervals = options.array(kIntervalsOption);
    if (!intervals || intervals.size() > limits::kHistogramBoundaries) return "summary only";
    return format("summary and histogram, %s %s", kIntervalsOption, inlineText(intervals));
  }
  std::string text;
  for (const std::string_view name : {kBucketIntervalOption, kSignificantFiguresOption}) {
    const auto number = options.number(name);
    if (!number) continue;
    if (!text.empty()) text += ", ";
    appendFormat(text, "%s %u", name, number->uint32());
  }
  return text.empty() ? "reported unchanged" : text;
}

}  // namespace tavrel
