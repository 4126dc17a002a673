// The statistics store of a device whose programs record into segments: its checkpoint folds first.
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
  /// A failed fold is a line in the log, once, and does not change the outcome: segments keep what
  /// they hold.
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
