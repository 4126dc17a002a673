#include <limits>

#include "ioreport/elements.h"
#include "ioreport/ioreport.h"
#include "tools/export/exports.h"
#include "tools/report/report_quantity.h"
#include "tools/report/report_sampler.h"

namespace tavrel {
namespace {

// Drives have their own metrics.
constexpr std::string_view kHealthGroup = "Health";

struct UnitName {
  std::string_view unit;  // of a converted value
  std::string_view name;  // at the end of a metric
};

constexpr UnitName kUnits[] = {
    {"bytes", "bytes"}, {"s", "seconds"}, {"W", "watts"},   {"J", "joules"}, {"A", "amperes"},
    {"V", "volts"},     {"F", "farads"},  {"H", "henries"}, {"Hz", "hertz"}, {"°C", "celsius"}};

/// Exports one channel to the page.
class ChannelExport {
 public:
  ChannelExport(const plist::Dictionary& channel, MetricPage& page)
      : channel_(channel), page_(page) {
    addLabel("driver", IOReportChannelGetDriverName(channel));
    addLabel("group", IOReportChannelGetGroup(channel));
    addLabel("subgroup", IOReportChannelGetSubGroup(channel));
    addLabel("channel", IOReportChannelGetChannelName(channel));
    const auto one = convertedValue(channel, 1);
    if (!one) return;
    for (const UnitName& unit : kUnits)
      if (unit.unit == one->unit) unit_ = unit.name;
  }

  void add() {
    switch (IOReportChannelGetFormat(channel_)) {
      case kFormatSimple:
        addValue("tavrel_channel", "Values of channels.", labels_,
                 IOReportSimpleGetIntegerValue(channel_));
        break;
      case kFormatState:
        addStates();
        break;
      case kFormatHistogram:
        addHistogram();
        break;
      case kFormatSimpleArray:
        addArray();
        break;
      default:
        break;
    }
  }

 private:
  void addLabel(std::string_view name, std::optional<std::string_view> value) {
    if (value && !value->empty()) labels_.emplace_back(name, *value);
  }

  MetricLabels with(std::string_view name, std::string value) const {
    MetricLabels labels = labels_;
    labels.emplace_back(name, std::move(value));
    return labels;
  }

  MetricFamily family(std::string name, std::string_view help) const {
    if (!unit_.empty()) name += "_" + std::string(unit_);
    return {std::move(name), unit_, help};
  }

  void addValue(const char* name, std::string_view help, const MetricLabels& labels,
                std::int64_t value) {
    if (value == kInvalidValue) return;
    if (unit_.empty()) return page_.gauge(family(name, help), labels, value);
    if (const auto converted = convertedValue(channel_, value))
      page_.gauge(family(name, help), labels, converted->value);
  }

  // Leaves out unsigned counts that are negative as signed ones.
  void addStates() {
    const std::int32_t count = IOReportStateGetCount(channel_);
    const plist::Array names = stateNames(channel_);
    for (std::int32_t state = 0; state < count; ++state) {
      const auto name = names.at(static_cast<std::size_t>(state)).string();
      const MetricLabels labels = with("state", name ? std::string(*name) : std::to_string(state));
      const std::int64_t residency = IOReportStateGetResidency(channel_, state);
      if (residency >= 0) {
        addValue("tavrel_channel_state", "How long states of channels have lasted.", labels,
                 residency);
      }
      const std::int64_t entries = IOReportStateGetInTransitions(channel_, state);
      if (entries < 0) continue;
      page_.gauge(
          {"tavrel_channel_state_entries", "", "How often states of channels were entered."},
          labels, entries);
    }
  }

  void addArray() {
    const Elements elements = elementsOfType(channel_, kFormatSimpleArray);
    const std::size_t count = getRawElements(channel_, kFormatSimpleArray).count();
    for (std::size_t i = 0; i < count * kElementValues; ++i) {
      const std::int64_t value = elements.value(i / kElementValues, i % kElementValues);
      if (value == kInvalidValue) continue;
      addValue("tavrel_channel_element", "Elements of channels that are arrays.",
               with("index", std::to_string(i)), value);
    }
  }

  // Leaves the histogram out when its counts or bounds are unknown or make no sense.
  void addHistogram() {
    const std::int32_t count = IOReportHistogramGetBucketCount(channel_);
    HistogramPoint point;
    std::uint64_t hits = 0;
    double sum = 0;
    bool isSumKnown = true;
    for (std::int32_t bucket = 0; bucket < count; ++bucket) {
      std::int64_t lower = 0, upper = 0;
      const std::int64_t more = IOReportHistogramGetBucketHits(channel_, bucket);
      if (more < 0 ||
          IOReportHistogramGetBucketBounds(channel_, bucket, &lower, &upper) != kKernelSuccess) {
        return;
      }
      const auto bound = inUnit(upper);
      if (!bound || __builtin_add_overflow(hits, static_cast<std::uint64_t>(more), &hits)) return;
      if (!point.buckets.empty() && *bound <= point.buckets.back().first) return;
      // The sum of a bucket is unset until it has a value.
      const auto part = more == 0 ? 0.0 : inUnit(IOReportHistogramGetBucketSum(channel_, bucket));
      isSumKnown = isSumKnown && part && *part >= 0 && lower >= 0;
      sum += part.value_or(0);
      point.buckets.emplace_back(*bound, hits);
    }
    // The last bucket holds everything above the previous one.
    if (!point.buckets.empty())
      point.buckets.back().first = std::numeric_limits<double>::infinity();
    if (!isSumKnown) return addBuckets(point);
    point.sum = sum;
    page_.histogram(family("tavrel_channel_distribution", "Histograms of channels."), labels_,
                    point);
  }

  // A histogram without a sum.
  void addBuckets(const HistogramPoint& point) {
    for (const auto& [bound, count] : point.buckets) {
      MetricLabels labels = with("up_to", boundOf(bound));
      if (!unit_.empty()) labels.emplace_back("unit", unit_);
      page_.gauge({"tavrel_channel_values", "",
                   "How many values of a channel do not exceed a bound: histograms without a sum."},
                  labels, static_cast<std::int64_t>(count));
    }
  }

  std::optional<double> inUnit(std::int64_t value) const {
    if (value == kInvalidValue) return std::nullopt;
    if (unit_.empty()) return static_cast<double>(value);
    const auto converted = convertedValue(channel_, value);
    return converted ? std::optional(converted->value) : std::nullopt;
  }

  const plist::Dictionary& channel_;
  MetricPage& page_;
  MetricLabels labels_;
  std::string_view unit_;
};

}  // namespace

void exportChannels(ToolContext& context, MetricPage& page) {
  // A device without drivers has no channels, which is not a fault.
  Sampler sampler(context, {}, Sampler::NoChannels::AreFine);
  if (!sampler) return;
  const plist::Dictionary samples = sampler.sample();
  if (!samples) return;
  for (const plist::Dictionary& channel : channelsIn(samples)) {
    if (IOReportChannelGetGroup(channel) != kHealthGroup) ChannelExport(channel, page).add();
  }
}

}  // namespace tavrel
