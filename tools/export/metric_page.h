// A page of metrics that is both OpenMetrics text and Prometheus' own text format.
//
//   MetricPage page;
//   page.gauge({"tavrel_store_size_bytes", "bytes", "Size of the store."}, {}, 4096);
//   out << page.text();
//
// Families come in the order of their names, metrics in that of their labels, so that equal figures
// give equal bytes. The two formats disagree on counters, so there are none: what counts is a gauge
// that grows.
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace tavrel {

/// A family of metrics. The name ends with the unit, when there is one.
struct MetricFamily {
  std::string name;
  std::string_view unit;
  std::string_view help;  // a sentence without quotation marks
};

/// Names and values. Values may be any bytes.
using MetricLabels = std::vector<std::pair<std::string_view, std::string>>;

/// Any bytes as the value of a label: a control character, a byte that is not UTF-8 and "%" become
/// "%" and two hexadecimal digits. A value of more than `kLongestLabel` bytes is cut and ends with
/// "%~" and 16 digits of the SHA-256 of all bytes. Different bytes give different values.
std::string labelValue(std::string_view bytes);
inline constexpr std::size_t kLongestLabel = 256;

struct SummaryPoint {
  std::uint64_t count = 0;
  std::optional<double> sum;
  std::vector<std::pair<double, double>> quantiles;  // from 0 to 1, ascending, and their values
};

struct HistogramPoint {
  /// Upper bounds, ascending, and how many values are not above them. The last bound is infinity.
  std::vector<std::pair<double, std::uint64_t>> buckets;
  std::optional<double> sum;
};

class MetricPage {
 public:
  /// Metrics of one family. Further ones are left out.
  static constexpr std::size_t kMetrics = 20'000;

  void gauge(const MetricFamily& family, const MetricLabels& labels, double value);
  /// Exact beyond 2^53.
  void gauge(const MetricFamily& family, const MetricLabels& labels, std::int64_t value);
  void summary(const MetricFamily& family, const MetricLabels& labels, const SummaryPoint& point);
  void histogram(const MetricFamily& family, const MetricLabels& labels,
                 const HistogramPoint& point);

  /// Metrics that were left out: a family had too many, or two had the same labels.
  std::uint64_t leftOut() const { return leftOut_; }

  std::string text() const;

 private:
  struct Family {
    std::string_view type, unit, help;
    std::map<std::string, std::string> metrics;  // from labels to lines
  };
  void add(const MetricFamily& family, std::string_view type, std::string&& labels,
           std::string&& lines);

  std::map<std::string, Family> families_;
  std::uint64_t leftOut_ = 0;
};

}  // namespace tavrel
