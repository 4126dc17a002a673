// The statistics store of a device whose programs record into segments: each checkpoint folds the
// segments first.
#pragma once

#include <memory>
#include <string>
#include <string_view>

#include "platform/linux/folding/segment_fold.h"
#include "platform/linux/store/sqlite_store.h"
#include "platform/statistics_store.h"
#include "platform/system_log.h"

namespace tavrel {

class FoldingStore final : public StatisticsStore {
 public:
  /// All must outlive it.
  FoldingStore(SqliteStore& store, SegmentFold& fold, SystemLog& log)
      : store_(store), fold_(fold), log_(log) {}

  std::int32_t BHDaysSince1970() override { return store_.BHDaysSince1970(); }
  plist::Date dateForDaysSince1970(std::int32_t day) override {
    return store_.dateForDaysSince1970(day);
  }
  /// Logs a failed fold once. It does not change the result: the segments keep what they hold.
  bool BHClientCheckpoint() override;
  void BHClientSetValueForScalarKey(std::string_view key, std::int64_t value) override {
    store_.BHClientSetValueForScalarKey(key, value);
  }
  /// After a failed fold, its queries say that rows are missing: those of the segments.
  std::unique_ptr<BHHistory> initWithDefaultPath() override;

 private:
  SqliteStore& store_;
  SegmentFold& fold_;
  SystemLog& log_;
  bool isFolded_ = true;
  std::string toldFailure_;
};

}  // namespace tavrel
