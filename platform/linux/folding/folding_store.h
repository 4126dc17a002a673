// The statistics store of a device whose programs record into segments: each checkpoint folds the
// segments first.
#pragma once

#include <memory>
#include <string>
#include <string_view>

#include "platform/linux/folding/segment_fold.h"
#include "platform/statistics_store.h"
#include "platform/system_log.h"

namespace tavrel {

class FoldingStore final : public StatisticsStore {
 public:
  /// All must outlive it.
  FoldingStore(StatisticsStore& store, SegmentFold& fold, SystemLog& log)
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
  std::unique_ptr<BHHistory> initWithDefaultPath() override { return store_.initWithDefaultPath(); }

 private:
  StatisticsStore& store_;
  SegmentFold& fold_;
  SystemLog& log_;
  std::string toldFailure_;
};

}  // namespace tavrel
