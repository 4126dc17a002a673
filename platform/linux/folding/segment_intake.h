// Takes what one segment yields, as far as rights and limits allow.
#pragma once

#include <cstdint>
#include <limits>
#include <map>
#include <span>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "platform/distribution_values.h"
#include "platform/linux/folding/recorders.h"
#include "platform/linux/folding/scalar_changes.h"
#include "platform/linux/segments/segment_reader.h"

namespace tavrel {

/// The rows of the store that one fold changes.
class FoldedRows {
 public:
  struct Row {
    // Of a scalar.
    std::int64_t latestSet = std::numeric_limits<std::int64_t>::min();
    std::int64_t added = 0;
  };

  /// Nothing when the row would be one too many. The first user of a row is charged with it.
  Row* find(std::uint32_t user, std::int32_t day, std::string_view key, bool isScalar);

 private:
  std::unordered_map<std::uint64_t, Row> rows_;  // by a keyed hash of its name
  std::unordered_map<std::uint32_t, std::size_t> counts_;
};

/// Memory for the measurements of one segment after the other: fresh pages cost more than their
/// use.
class SampleBuffers {
  friend class SegmentIntake;
  // A measurement, in the order of recording.
  struct Sample {
    double value;
    std::uint32_t secondsInDay;
    std::uint32_t series;  // its place in the intake
  };
  std::vector<Sample> recorded_;
  std::vector<DistributionSample> bySeries_;
};

class SegmentIntake final : public SegmentSink {
 public:
  /// All must outlive it. So must the reader of the segment. No other intake may use the buffers
  /// meanwhile.
  SegmentIntake(std::uint32_t user, const Recorders& recorders, FoldedRows& rows,
                ScalarChanges& changes, SampleBuffers& buffers)
      : user_(user), recorders_(recorders), rows_(rows), changes_(changes), buffers_(buffers) {
    buffers_.recorded_.clear();
  }

  void takeScalar(const SegmentScalar& scalar) override;
  void takeRecord(const SegmentRecord& record) override;

  /// Passes the measurements on, each key and day once: `take(day, key, samples)`. Scalars are in
  /// the changes already.
  template <class Take>
  void eachSeries(Take take) const {
    std::span<const DistributionSample> rest = samplesBySeries();
    for (const Series& series : series_) {
      if (series.count > 0) take(series.day, series.key, rest.first(series.count));
      rest = rest.subspan(series.count);
    }
  }

  std::uint64_t scalars() const { return scalars_; }
  std::uint64_t values() const { return buffers_.recorded_.size(); }
  std::uint64_t refused() const { return refused_; }
  /// The first key that the user may not record; empty when there was none.
  const std::string& foreignKey() const { return foreignKey_; }

 private:
  // The measurements of a key and a day.
  struct Series {
    std::string_view key;
    std::int32_t day = 0;
    bool isRefused = false;
    std::size_t count = 0;
  };
  // Of a key, the series that was used last.
  struct RecentSeries {
    std::int32_t day = 0;
    std::uint32_t place = kNone;
  };
  static constexpr std::uint32_t kNone = 0xffffffff;
  bool mayTake(std::string_view key, std::int32_t day);
  std::uint32_t findSeries(const SegmentRecord& record);
  std::span<const DistributionSample> samplesBySeries() const;

  const std::uint32_t user_;
  const Recorders& recorders_;
  FoldedRows& rows_;
  ScalarChanges& changes_;
  SampleBuffers& buffers_;
  std::vector<Series> series_;
  std::map<std::pair<std::uint32_t, std::int32_t>, std::uint32_t> places_;  // by key's number, day
  std::vector<RecentSeries> recent_;                                        // by key's number
  std::uint64_t scalars_ = 0;
  std::uint64_t refused_ = 0;
  std::string foreignKey_;
};

}  // namespace tavrel
