// A statistics store that remembers the earliest day whose rows were read. So code that files a log
// made from them knows how old its statistics are, whatever the run claims.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string_view>
#include <utility>

#include "platform/statistics_store.h"

namespace tavrel {

class DayNotingStore final : public StatisticsStore {
 public:
  /// The store must outlive it, and it must outlive the histories that it returns.
  explicit DayNotingStore(StatisticsStore& store) : store_(store) {}

  /// The earliest day whose rows may have been read since the last call; nothing when none were.
  std::optional<std::int64_t> takeEarliest() { return std::exchange(earliest_, std::nullopt); }

  std::int32_t BHDaysSince1970() override { return store_.BHDaysSince1970(); }
  plist::Date dateForDaysSince1970(std::int32_t day) override {
    return store_.dateForDaysSince1970(day);
  }
  bool BHClientCheckpoint() override { return store_.BHClientCheckpoint(); }
  void BHClientSetValueForScalarKey(std::string_view key, std::int64_t value) override {
    store_.BHClientSetValueForScalarKey(key, value);
  }
  std::unique_ptr<BHHistory> initWithDefaultPath() override;

 private:
  class History;

  StatisticsStore& store_;
  std::optional<std::int64_t> earliest_;
};

}  // namespace tavrel
