#include "platform/linux/folding/unfolded_store.h"

#include <algorithm>
#include <limits>
#include <unistd.h>
#include <utility>

#include "platform/linux/folding/recorded_history.h"
#include "platform/linux/folding/recorders.h"

namespace tavrel {

class UnfoldedStore::History final : public BHHistory {
 public:
  explicit History(UnfoldedStore& store) : store_(store) {}

  bool scalarsForKeyPrefix(std::string_view prefix, std::int64_t minDaysSince1970,
                           std::int64_t maxDaysSince1970,
                           const ScalarRowHandler& rowHandler) override {
    auto rows = open(prefix, minDaysSince1970, maxDaysSince1970, false);
    if (!rows) return !hasFailed_;
    if (Status walked = rows->walkScalars(rowHandler); !walked) fail(walked.error());
    return !hasFailed_;
  }

  bool distributionsForKeyPrefix(std::string_view prefix, std::int64_t minDaysSince1970,
                                 std::int64_t maxDaysSince1970,
                                 const DistributionRowHandler& rowHandler) override {
    auto rows = open(prefix, minDaysSince1970, maxDaysSince1970, true);
    if (!rows) return !hasFailed_;
    const Status walked =
        rows->walkDistributions([&](std::string_view key, std::int32_t day, std::int64_t,
                                    BHHistoryDistributionEnumerator& values,
                                    bool& stop) { rowHandler(key, day, values, stop); });
    if (!walked) fail(walked.error());
    return !hasFailed_;
  }

 private:
  // Days after `before`, up to `last`.
  std::optional<RecordedHistory> open(std::string_view prefix, std::int64_t before,
                                      std::int64_t last, bool hasValues) {
    using Day = std::numeric_limits<std::int32_t>;
    if (hasFailed_ || before >= last || before >= Day::max() || last < Day::min()) return {};
    const auto firstDay = std::max(before, std::int64_t{Day::min()} - 1) + 1;
    const auto lastDay = std::min(last, std::int64_t{Day::max()});
    const Recorders recorders =
        Recorders::read(store_.root_, store_.files_, store_.propertyLists_, store_.log_);
    auto history = RecordedHistory::open(store_.root_, store_.store_, recorders,
                                         {.key = std::string(prefix),
                                          .firstDay = static_cast<std::int32_t>(firstDay),
                                          .lastDay = static_cast<std::int32_t>(lastDay),
                                          .hasValues = hasValues});
    if (!history) {
      fail(history.error());
      return {};
    }
    if (history->warning()) store_.missing_ = history->warning();
    return *std::move(history);
  }

  void fail(const Error& error) {
    hasFailed_ = true;
    store_.log_.write(LogLevel::Error, error.message);
  }

  UnfoldedStore& store_;
  bool hasFailed_ = false;
};

std::unique_ptr<BHHistory> UnfoldedStore::initWithDefaultPath() {
  const auto folder = SegmentFolder::open(root_);
  if (folder && !*folder) return store_.initWithDefaultPath();
  if (folder) {
    const auto listing = (*folder)->list();
    if (listing && listing->segments.empty()) return store_.initWithDefaultPath();
    if (listing) noteSegmentsOfOthers(listing->segments);
  }
  // A folder that cannot be read fails there again, with a message.
  return std::make_unique<History>(*this);
}

// A segment can be read by its owner and by root, who folds it.
void UnfoldedStore::noteSegmentsOfOthers(const std::vector<SegmentEntry>& segments) {
  const uid_t user = geteuid();
  if (user == 0) return;
  const auto others =
      std::ranges::count_if(segments, [&](const auto& entry) { return entry.owner != user; });
  if (others == 0) return;
  missing_ = "what waits in segments of other users (" + std::to_string(others) +
             ") is not shown: run it as root";
}

}  // namespace tavrel
