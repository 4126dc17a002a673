// A statistics store in front of another one. Stores derive from it that change some operations.
#pragma once

#include <cstdint>
#include <memory>
#include <string_view>

#include "platform/statistics_store.h"

namespace tavrel {

class ForwardingStore : public StatisticsStore {
 public:
  /// The store below must outlive it.
  explicit ForwardingStore(StatisticsStore& below) : below_(below) {}

  std::int32_t BHDaysSince1970() override { return below_.BHDaysSince1970(); }
  plist::Date dateForDaysSince1970(std::int32_t day) override {
    return below_.dateForDaysSince1970(day);
  }
  bool BHClientCheckpoint() override { return below_.BHClientCheckpoint(); }
  void BHClientSetValueForScalarKey(std::string_view key, std::int64_t value) override {
    below_.BHClientSetValueForScalarKey(key, value);
  }
  std::unique_ptr<BHHistory> initWithDefaultPath() override { return below_.initWithDefaultPath(); }

 private:
  StatisticsStore& below_;
};

}  // namespace tavrel
