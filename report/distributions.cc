#include "report/bh_report.h"
#include "report/histogram.h"

namespace tavrel {
namespace {

/// Welford's running summary: one pass, constant memory.
class Summary {
 public:
  /// Adds packed values and calls `also` with each. Not inlined, so that the numbers stay in
  /// registers: each value depends on the mean of the previous one.
  template <class Also>
  [[gnu::noinline]] void addAll(std::string_view values, Also also) {
    Summary next = *this;
    for (; !values.empty(); values.remove_prefix(kPackedValueBytes)) {
      const double value = packedValueAt(values.data());
      next.add(value);
      also(value);
    }
    *this = next;
  }

  plist::Array numbers() const {
    return {minimum_, maximum_, mean_, squaredDeviations_, static_cast<std::int32_t>(count_)};
  }

 private:
  void add(double value) {
    if (count_ == 0) {
      minimum_ = maximum_ = mean_ = value;
      count_ = 1;
      return;
    }
    if (value < minimum_) {
      minimum_ = value;
    } else if (value > maximum_) {
      maximum_ = value;
    }
    ++count_;
    const double delta = value - mean_;
    mean_ += delta / static_cast<std::int32_t>(count_);
    squaredDeviations_ += delta * (value - mean_);
  }

  double minimum_ = 0;
  double maximum_ = 0;
  double mean_ = 0;
  double squaredDeviations_ = 0;
  std::uint32_t count_ = 0;  // reported as a signed 32-bit number
};

}  // namespace

void BHReport::computeAndAddDistribution(BHHistoryDistributionEnumerator& values,
                                         std::string_view forKey,
                                         const plist::Dictionary& withOptions) {
  std::optional<Histogram> histogram;
  const plist::Array intervals = withOptions.array(kIntervalsOption);
  if (intervals) {
    platform_.log->log(LogLevel::Debug, "Treating key %@ as a histogram", forKey);
    histogram = Histogram::create(intervals);
    if (!histogram) {
      platform_.log->log(LogLevel::Default, "%s%@. Will not calculate histogram values",
                         kHistogramLeftOut, forKey);
    }
  }

  Summary summary;
  for (auto block = values.nextValues(); !block.empty(); block = values.nextValues()) {
    if (histogram) {
      summary.addAll(block, [&](double value) { histogram->count(value); });
    } else {
      summary.addAll(block, [](double) {});
    }
  }

  // A summary of some values would look like a summary of all.
  if (values.failed()) return;

  if (histogram) {
    _histogramsOutput.set(
        forKey, histogramDictForIntervals(intervals, histogram->counts(), histogramLabels_));
  }
  _distributionsOutput.set(forKey, summary.numbers());
}

}  // namespace tavrel
