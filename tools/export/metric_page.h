// A page of metrics that is valid both as OpenMetrics text and in Prometheus' own text format.
//
//   MetricPage page;
//   page.gauge({"tavrel_store_size_bytes", "bytes", "Size of the store."}, {}, 4096);
//   out << page.text();
//
// Families are sorted by name and metrics by label, so that equal figures give equal
// bytes. The two formats disagree on counters, so there are none: a count is
// exported as a gauge that grows.
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace tavrel {

/// A family of metrics. The name ends with the unit, if there is one.
struct MetricFamily {
  std::string name;
  std::string_view unit;
  std::string_view help;  // a sentence without quotation marks
};

/// Names and values. Values may be any bytes.
using MetricLabels = std::vector<std::pair<std::string_view, std::string>>;

/// Encodes any bytes as the value of a label: control characters, bytes that are not UTF-8 and "%"
/// become "%" and two hexadecimal digits. Cuts values of more than `kLongestLabel` bytes and
/// appends "%~" and 16 digits of the SHA-256 of all bytes. Different bytes give different values.
std::string labelValue(std::string_view bytes);
inline constexpr std::size_t kLongestLabel = 256;

/// A number as the value of a label: OpenMetrics requires a fraction even for whole ones.
std::string boundOf(double value);

// Both have a sum: readers such as node_exporter take an absent one for 0.

struct SummaryPoint {
  std::uint64_t count = 0;
  double sum = 0;
  std::vector<std::pair<double, double>> quantiles;  // from 0 to 1, ascending, and their values
};

struct HistogramPoint {
  /// Upper bounds, ascending, and how many values do not exceed each. The last bound is infinity.
  std::vector<std::pair<double, std::uint64_t>> buckets;
  double sum = 0;
};

class MetricPage {
 public:
  /// How many metrics a family may have; further ones are left out.
  static constexpr std::size_t kMetrics = 20'000;

  void gauge(const MetricFamily& family, const MetricLabels& labels, double value);
  /// Exact even beyond 2^53.
  void gauge(const MetricFamily& family, const MetricLabels& labels, std::int64_t value);
  void summary(const MetricFamily& family, const MetricLabels& labels, const SummaryPoint& point);
  void histogram(const MetricFamily& family, const MetricLabels& labels,
                 const HistogramPoint& point);

  /// Metrics left out because their family had too many, or because two had the same labels.
  std::uint64_t leftOut() const { return leftOut_; }

  std::string text() const;

 private:
  struct Family {
    std::string_view type, unit, help;
    std::map<std::string, std::string> metrics;  // from labels to lines
  };
  /// `write` makes the lines from the text of the labels. It is called only if there is room.
  template <class Write>
  void add(const MetricFamily& family, std::string_view type, const MetricLabels& labels,
           const Write& write);

  std::map<std::string, Family> families_;
  std::uint64_t leftOut_ = 0;
};

}  // namespace tavrel
