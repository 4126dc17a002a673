#include "platform/linux/logs/day_noting_store.h"

#include <algorithm>

#include "base/arithmetic.h"

namespace tavrel {

class DayNotingStore::History final : public BHHistory {
 public:
  History(std::unique_ptr<BHHistory> history, std::optional<std::int64_t>& earliest)
      : history_(std::move(history)), earliest_(earliest) {}

  bool scalarsForKeyPrefix(std::string_view prefix, std::int64_t minDaysSince1970,
                           std::int64_t maxDaysSince1970,
                           const ScalarRowHandler& rowHandler) override {
    note(minDaysSince1970);
    return history_->scalarsForKeyPrefix(prefix, minDaysSince1970, maxDaysSince1970, rowHandler);
  }
  bool distributionsForKeyPrefix(std::string_view prefix, std::int64_t minDaysSince1970,
                                 std::int64_t maxDaysSince1970,
                                 const DistributionRowHandler& rowHandler) override {
    note(minDaysSince1970);
    return history_->distributionsForKeyPrefix(prefix, minDaysSince1970, maxDaysSince1970,
                                               rowHandler);
  }

 private:
  // The lower bound is exclusive: rows begin on the day after it.
  void note(std::int64_t dayBefore) {
    const std::int64_t day = wrappingAdd(dayBefore, std::int64_t{1});
    earliest_ = std::min(earliest_.value_or(day), day);
  }

  std::unique_ptr<BHHistory> history_;
  std::optional<std::int64_t>& earliest_;
};

std::unique_ptr<BHHistory> DayNotingStore::initWithDefaultPath() {
  return std::make_unique<History>(ForwardingStore::initWithDefaultPath(), earliest_);
}

}  // namespace tavrel
