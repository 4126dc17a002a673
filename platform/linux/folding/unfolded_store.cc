#include "platform/linux/folding/unfolded_store.h"

#include <algorithm>
#include <limits>
#include <optional>
#include <string>
#include <unistd.h>
#include <utility>

#include "platform/linux/folding/recorded_history.h"
#include "platform/linux/folding/recorders.h"

namespace tavrel {

class UnfoldedStore::History final : public BHHistory {
 public:
  History(UnfoldedStore& store, Recorders recorders)
      : store_(store), recorders_(std::move(recorders)) {}

  bool scalarsForKeyPrefix(std::string_view prefix, std::int64_t minDaysSince1970,
                           std::int64_t maxDaysSince1970,
                           const ScalarRowHandler& rowHandler) override {
    if (select(prefix, minDaysSince1970, maxDaysSince1970)) {
      if (Status walked = rows_->walkScalars(rowHandler); !walked) fail(walked.error());
    }
    return isComplete();
  }

  bool distributionsForKeyPrefix(std::string_view prefix, std::int64_t minDaysSince1970,
                                 std::int64_t maxDaysSince1970,
                                 const DistributionRowHandler& rowHandler) override {
    if (select(prefix, minDaysSince1970, maxDaysSince1970)) {
      const Status walked =
          rows_->walkDistributions([&](std::string_view key, std::int32_t day, std::int64_t,
                                       BHHistoryDistributionEnumerator& values,
                                       bool& stop) { rowHandler(key, day, values, stop); });
      if (!walked) fail(walked.error());
    }
    return isComplete();
  }

 private:
  // Opens the rows of days after `before`, up to `last`. Successive queries of the same rows share
  // them, so that no fold comes between these. False when there is nothing to walk.
  bool select(std::string_view prefix, std::int64_t before, std::int64_t last) {
    using Day = std::numeric_limits<std::int32_t>;
    if (hasFailed_ || before >= last || before >= Day::max() || last < Day::min()) return false;
    const auto firstDay = std::max(before, std::int64_t{Day::min()} - 1) + 1;
    const auto lastDay = std::min(last, std::int64_t{Day::max()});
    RowSelection selection{.key = std::string(prefix),
                           .firstDay = static_cast<std::int32_t>(firstDay),
                           .lastDay = static_cast<std::int32_t>(lastDay)};
    if (rows_ && selection == selection_) return true;
    rows_.reset();
    selection_ = std::move(selection);
    auto rows = RecordedHistory::open(store_.root_, store_.store_, recorders_, selection_);
    if (!rows) {
      fail(rows.error());
      return false;
    }
    rows_ = *std::move(rows);
    lacksRows_ = !rows_->isStoreComplete(before);
    if (rows_->storeFault()) store_.log_.write(LogLevel::Error, rows_->storeFault()->message);
    store_.missing_.insert(store_.missing_.end(), rows_->missingValues().begin(),
                           rows_->missingValues().end());
    return true;
  }

  bool isComplete() const { return !hasFailed_ && !lacksRows_; }

  void fail(const Error& error) {
    hasFailed_ = true;
    store_.log_.write(LogLevel::Error, error.message);
  }

  UnfoldedStore& store_;
  const Recorders recorders_;
  RowSelection selection_;
  std::optional<RecordedHistory> rows_;
  bool hasFailed_ = false;
  bool lacksRows_ = false;
};

std::unique_ptr<BHHistory> UnfoldedStore::initWithDefaultPath() {
  missing_.clear();
  const auto folder = SegmentFolder::open(root_);
  if (folder && !*folder) return store_.initWithDefaultPath();
  if (folder) {
    const auto listing = (*folder)->list();
    if (listing && listing->segments.empty()) return store_.initWithDefaultPath();
    if (listing) noteSegmentsOfOthers(listing->segments);
  }
  // A folder that cannot be read fails there again, with a message.
  return std::make_unique<History>(*this, Recorders::read(root_, files_, propertyLists_, log_));
}

// A segment can be read by its owner and by root, who folds it.
void UnfoldedStore::noteSegmentsOfOthers(const std::vector<SegmentEntry>& segments) {
  const uid_t user = geteuid();
  if (user == 0) return;
  const auto others =
      std::ranges::count_if(segments, [&](const auto& entry) { return entry.owner != user; });
  if (others == 0) return;
  missing_.push_back("what waits in segments of other users (" + std::to_string(others) +
                     ") is not shown: run it as root");
}

}  // namespace tavrel
