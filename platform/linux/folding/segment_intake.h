// Takes the values of one segment, as far as rights and limits allow.
#pragma once

#include <cstdint>
#include <limits>
#include <map>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "platform/linux/folding/recorders.h"
#include "platform/linux/folding/scalar_changes.h"
#include "platform/linux/segments/segment_reader.h"
#include "platform/linux/store/pending_distributions.h"

namespace tavrel {

/// The rows of the store that one fold changes.
class FoldedRows {
 public:
  struct Row {
    // Of a scalar.
    std::int64_t latestSet = std::numeric_limits<std::int64_t>::min();
    std::int64_t added = 0;
  };

  /// Null when the row would be one too many. A row counts for the user who changes it first.
  Row* find(std::uint32_t user, std::int32_t day, std::string_view key, bool isScalar);

  std::size_t size() const { return rows_.size(); }

 private:
  std::unordered_map<std::uint64_t, Row> rows_;  // by a keyed hash of its name
  std::unordered_map<std::uint32_t, std::size_t> counts_;
};

class SegmentIntake final : public SegmentSink {
 public:
  /// All must outlive it. Scalars go to the changes, measurements to the distributions, which must
  /// not be cleared meanwhile.
  SegmentIntake(std::uint32_t user, const Recorders& recorders, FoldedRows& rows,
                ScalarChanges& changes, PendingDistributions& distributions)
      : user_(user),
        recorders_(recorders),
        rows_(rows),
        changes_(changes),
        distributions_(distributions) {}

  void takeScalar(const SegmentScalar& scalar) override;
  void takeRecord(const SegmentRecord& record) override;

  std::uint64_t scalars() const { return scalars_; }
  std::uint64_t values() const { return values_; }
  std::uint64_t refused() const { return refused_; }
  /// The first key that the user may not record; empty when there was none.
  const std::string& foreignKey() const { return foreignKey_; }

 private:
  using Series = PendingDistributions::Series;
  // The series that a key used last.
  struct RecentSeries {
    std::int32_t day = 0;
    bool isKnown = false;
    Series* series = nullptr;  // null: measurements are refused
  };
  bool mayTake(std::string_view key, std::int32_t day);
  Series* findSeries(const SegmentRecord& record);

  const std::uint32_t user_;
  const Recorders& recorders_;
  FoldedRows& rows_;
  ScalarChanges& changes_;
  PendingDistributions& distributions_;
  std::map<std::pair<std::uint32_t, std::int32_t>, Series*> series_;  // by key's number, day
  std::vector<RecentSeries> recent_;                                  // by key's number
  std::uint64_t scalars_ = 0;
  std::uint64_t values_ = 0;
  std::uint64_t refused_ = 0;
  std::string foreignKey_;
};

/// Takes nothing, and notes whether there was anything to take.
class SegmentLook final : public SegmentSink {
 public:
  void takeScalar(const SegmentScalar&) override { hasValues_ = true; }
  void takeRecord(const SegmentRecord&) override { hasValues_ = true; }
  bool hasValues() const { return hasValues_; }

 private:
  bool hasValues_ = false;
};

}  // namespace tavrel
