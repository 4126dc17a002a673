#include "tools/stat/value_summary.h"

#include <algorithm>
#include <bit>
#include <cmath>

#include "base/format.h"

namespace tavrel {
namespace {

constexpr int kBitsPerPass = 16;
constexpr std::size_t kDigits = std::size_t{1} << kBitsPerPass;
constexpr std::uint64_t kSign = std::uint64_t{1} << 63;
constexpr double kMostBuckets = 11;

// Maps values to bits that sort in the same order, and back.
std::uint64_t orderedBits(double value) {
  const auto bits = std::bit_cast<std::uint64_t>(value);
  return bits & kSign ? ~bits : bits | kSign;
}
double valueOf(std::uint64_t ordered) {
  return std::bit_cast<double>(ordered & kSign ? ordered & ~kSign : ~ordered);
}

// The smallest number of at least `width` that is 1, 2 or 5 times a power of ten.
double roundedUp(double width) {
  const double power = std::pow(10, std::floor(std::log10(width)));
  for (const double factor : {1.0, 2.0, 5.0}) {
    if (factor * power >= width) return factor * power;
  }
  return 10 * power;
}

// Enough digits to distinguish bounds, few enough to hide rounding errors.
std::string boundText(double bound) {
  return format("%.15g", bound);
}

}  // namespace

void Summary::add(double value) {
  if (std::isnan(value)) {
    ++notNumbers_;
    return;
  }
  minimum_ = numbers_ == 0 ? value : std::min(minimum_, value);
  maximum_ = numbers_ == 0 ? value : std::max(maximum_, value);
  ++numbers_;
  if (!std::isfinite(value)) return;
  lowest_ = finite_ == 0 ? value : std::min(lowest_, value);
  highest_ = finite_ == 0 ? value : std::max(highest_, value);
  areWhole_ = areWhole_ && value == std::floor(value);
  ++finite_;
  const double step = value - mean_;
  mean_ += step / static_cast<double>(finite_);
  squaredDeviations_ += step * (value - mean_);
}

double Summary::mean() const {
  // With infinities, mean_ is useless, but the sum of the extremes gives the right result.
  return finite_ == numbers_ ? mean_ : minimum_ + maximum_;
}

double Summary::standardDeviation() const {
  if (finite_ != numbers_) return std::nan("");
  return std::sqrt(squaredDeviations_ / static_cast<double>(finite_));
}

PercentileSearch::PercentileSearch(std::int64_t numbers, std::span<const int> percents) {
  if (numbers <= 0) return;
  for (const int percent : percents) {
    // Rounds up without a product that could overflow.
    const std::int64_t place = numbers / 100 * percent + (numbers % 100 * percent + 99) / 100;
    wanted_.push_back({std::max<std::int64_t>(place, 1) - 1, 0});
  }
  beginPass();
}

void PercentileSearch::beginPass() {
  branches_.clear();
  if (!needsPass()) return;
  for (const Wanted& wanted : wanted_) {
    const bool isKnown = std::any_of(branches_.begin(), branches_.end(), [&](const Branch& branch) {
      return branch.upperBits == wanted.upperBits;
    });
    if (!isKnown) branches_.push_back({wanted.upperBits, std::vector<std::int64_t>(kDigits)});
  }
}

void PercentileSearch::add(double value) {
  if (std::isnan(value)) return;
  const std::uint64_t bits = orderedBits(value);
  const std::uint64_t upperBits = bitsKnown_ == 0 ? 0 : bits >> (64 - bitsKnown_);
  for (Branch& branch : branches_) {
    if (branch.upperBits != upperBits) continue;
    ++branch.counts[(bits >> (64 - kBitsPerPass - bitsKnown_)) % kDigits];
    return;
  }
}

void PercentileSearch::endPass() {
  for (Wanted& wanted : wanted_) {
    const auto branch = std::find_if(branches_.begin(), branches_.end(), [&](const Branch& known) {
      return known.upperBits == wanted.upperBits;
    });
    std::size_t digit = 0;
    for (; digit + 1 < kDigits && wanted.rank >= branch->counts[digit]; ++digit)
      wanted.rank -= branch->counts[digit];
    wanted.upperBits = wanted.upperBits << kBitsPerPass | digit;
  }
  bitsKnown_ += kBitsPerPass;
  beginPass();
}

std::vector<double> PercentileSearch::values() const {
  std::vector<double> values;
  for (const Wanted& wanted : wanted_)
    values.push_back(valueOf(wanted.upperBits));
  return values;
}

RoundHistogram::RoundHistogram(const Summary& summary)
    : lowest_(summary.lowest()), highest_(summary.highest()) {
  if (!summary.hasFinite()) return;
  double buckets = 1;
  // Divides first, because the difference may exceed the range of a double.
  const double narrowest = highest_ / kMostBuckets - lowest_ / kMostBuckets;
  if (std::isnormal(narrowest)) {
    width_ = roundedUp(narrowest);
    if (summary.areWhole()) width_ = std::max(width_, 1.0);
    first_ = std::ceil(lowest_ / width_) - 1;
    buckets = std::clamp(std::ceil(highest_ / width_) - first_, 1.0, kMostBuckets + 1);
  }
  counts_.resize(static_cast<std::size_t>(buckets));
}

void RoundHistogram::add(double value) {
  if (std::isnan(value)) return;
  if (std::isinf(value)) {
    ++(value < 0 ? below_ : above_);
    return;
  }
  const double place = width_ == 0 ? 0 : std::ceil(value / width_) - 1 - first_;
  const auto last = static_cast<double>(counts_.size() - 1);
  ++counts_[static_cast<std::size_t>(std::clamp(place, 0.0, last))];
}

std::vector<DistributionView::Bucket> RoundHistogram::buckets() const {
  std::vector<DistributionView::Bucket> buckets;
  if (below_ > 0) buckets.push_back({"-inf", below_});
  for (std::size_t i = 0; i < counts_.size(); ++i) {
    const double place = first_ + static_cast<double>(i);
    const std::string label =
        width_ == 0
            ? "[" + boundText(lowest_) + ", " + boundText(highest_) + "]"
            : "(" + boundText(place * width_) + ", " + boundText((place + 1) * width_) + "]";
    buckets.push_back({label, counts_[i]});
  }
  if (above_ > 0) buckets.push_back({"inf", above_});
  return buckets;
}

}  // namespace tavrel
