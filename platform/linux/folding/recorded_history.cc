#include "platform/linux/folding/recorded_history.h"

#include <algorithm>
#include <array>
#include <utility>

#include "platform/linux/files/file_system.h"
#include "platform/linux/folding/fold_notes.h"

namespace tavrel {
namespace {

// How often to read again after a fold has come in between.
constexpr int kAttempts = 5;

bool isSame(const timespec& a, const timespec& b) {
  return a.tv_sec == b.tv_sec && a.tv_nsec == b.tv_nsec;
}

/// The values of a row: those in the store, then the waiting ones.
class JoinedEnumerator final : public BHHistoryDistributionEnumerator {
 public:
  JoinedEnumerator(BHHistoryDistributionEnumerator* stored, const WaitingValues& waiting,
                   const WaitingValues::Series& series)
      : stored_(stored), waiting_(waiting), series_(series) {}

  /// Why waiting values could not be read.
  const Status& status() const { return status_; }

 private:
  static constexpr std::size_t kAtOnce = 1024;

  DistributionBlock nextBlock(bool wantsOffsets) override {
    values_.clear();
    offsets_.clear();
    if (stored_ != nullptr) {
      if (wantsOffsets) {
        DistributionSample sample;
        while (values_.size() < kAtOnce * kPackedValueBytes &&
               stored_->getNextValue(sample.value, sample.secondsInDayOffset)) {
          appendPacked(values_, offsets_, std::span(&sample, 1));
        }
        if (!values_.empty()) return {values_, offsets_};
      } else if (const std::string_view values = stored_->nextValues(); !values.empty()) {
        return {values, {}};
      }
      if (stored_->failed()) {
        fail();
        return {};
      }
      stored_ = nullptr;
    }
    std::array<DistributionSample, kAtOnce> samples;
    const auto count = waiting_.readSeries(series_, place_, samples);
    if (!count) {
      status_ = count.error();
      fail();
      return {};
    }
    appendPacked(values_, offsets_, std::span(samples).first(*count));
    return {values_, offsets_};
  }

  BHHistoryDistributionEnumerator* stored_;
  const WaitingValues& waiting_;
  const WaitingValues::Series& series_;
  WaitingValues::Series::Place place_;
  Status status_ = Done{};
  std::string values_;
  std::string offsets_;
};

std::int64_t changed(const ScalarChanges::Change& change, std::int64_t stored) {
  const std::int64_t value = change.isSet ? change.value : stored;
  std::int64_t sum = 0;
  return __builtin_add_overflow(value, change.added, &sum) ? value : sum;
}

template <class Row>
void extend(std::optional<SqliteHistory::DaySpan>& span, const RowMap<Row>& rows) {
  if (rows.empty()) return;
  const std::int32_t first = rows.begin()->first.first;
  const std::int32_t last = rows.rbegin()->first.first;
  if (!span) span = SqliteHistory::DaySpan{first, last};
  span->first = std::min(span->first, first);
  span->last = std::max(span->last, last);
}

}  // namespace

Expected<RecordedHistory> RecordedHistory::open(const DeviceRoot& root, SqliteStore& store,
                                                const Recorders& recorders,
                                                RowSelection selection) {
  RecordedHistory history;
  history.selection_ = std::move(selection);
  const auto folder = SegmentFolder::open(root);
  if (!folder) {
    if (!SegmentFolder::isOutOfReach(root)) return folder.error();
    history.missingValues_.push_back(folder.error().message +
                                     "; what waits to be folded is not shown");
  }
  bool isOvertaken = true;
  for (int attempt = 0; attempt < kAttempts && isOvertaken; ++attempt) {
    const timespec mark = FoldNotes::lastMark(root);
    auto stored = store.openHistory();
    if (stored) {
      history.stored_ = *std::move(stored);
      history.storeFault_.reset();
      if (Status begun = history.stored_->beginSnapshot(); !begun) return begun.error();
    } else if (folder && *folder && FileSystem::isClosed(store.path())) {
      history.stored_.reset();
      history.storeFault_ = stored.error();
    } else {
      return stored.error();
    }
    if (!folder || !*folder) return history;
    auto waiting =
        WaitingValues::read(**folder, recorders, history.stored_.get(), history.selection_);
    if (!waiting) return waiting.error();
    history.waiting_ = *std::move(waiting);
    isOvertaken = !isSame(FoldNotes::lastMark(root), mark);
  }
  const auto addMissing = [&history](std::uint64_t segments, const std::string& advice) {
    if (segments == 0) return;
    history.missingValues_.push_back(std::to_string(segments) +
                                     (segments == 1 ? " segment with values that wait is"
                                                    : " segments with values that wait are") +
                                     " not shown: " + advice);
  };
  addMissing(history.waiting_->leftOut(), "run 'tavrelctl stat fold'");
  addMissing(history.waiting_->withoutRights(), "try again when " + root.path(kRecordersFile) +
                                                    " can be read and its users looked up");
  if (isOvertaken) {
    history.missingValues_.emplace_back(
        "folds took values during each attempt to read them, and some are not shown: run it again");
  }
  return history;
}

std::vector<std::string> RecordedHistory::warnings() const {
  std::vector<std::string> lines;
  if (storeFault_) {
    lines.push_back(storeFault_->message + "; only what waits to be folded is shown");
  }
  lines.insert(lines.end(), missingValues_.begin(), missingValues_.end());
  return lines;
}

Status RecordedHistory::walkStoredScalars(const BHHistory::ScalarRowHandler& rowHandler) {
  if (!stored_) return Done{};
  const RowSelection& rows = selection_;
  return rows.isPrefix ? stored_->walkScalars(rows.key, rows.firstDay, rows.lastDay, rowHandler)
                       : stored_->walkScalar(rows.key, rows.firstDay, rows.lastDay, rowHandler);
}

Status RecordedHistory::walkStoredDistributions(
    const SqliteHistory::CountedRowHandler& rowHandler) {
  if (!stored_) return Done{};
  const RowSelection& rows = selection_;
  return rows.isPrefix
             ? stored_->walkDistributions(rows.key, rows.firstDay, rows.lastDay, rowHandler)
             : stored_->walkDistribution(rows.key, rows.firstDay, rows.lastDay, rowHandler);
}

Status RecordedHistory::walkScalars(const BHHistory::ScalarRowHandler& rowHandler) {
  if (!waiting_) return walkStoredScalars(rowHandler);
  const auto& rows = waiting_->scalars();
  auto next = rows.begin();
  bool isStopped = false;
  const auto passBefore = [&](const auto& isBefore) {
    for (; !isStopped && next != rows.end() && isBefore(next->first); ++next)
      rowHandler(next->first.second, next->first.first, changed(next->second, 0), isStopped);
  };
  const Status walked = walkStoredScalars(
      [&](std::string_view key, std::int32_t day, std::int64_t value, bool& stop) {
        const std::pair name(day, key);
        passBefore([&](const RowName& row) { return LessRowName()(row, name); });
        if (!isStopped) {
          const bool isJoined = next != rows.end() && !LessRowName()(name, next->first);
          rowHandler(key, day, isJoined ? changed(next->second, value) : value, isStopped);
          if (isJoined) ++next;
        }
        stop = isStopped;
      });
  if (walked) passBefore([](const RowName&) { return true; });
  return walked;
}

Status RecordedHistory::walkDistributions(const SqliteHistory::CountedRowHandler& rowHandler) {
  if (!waiting_) return walkStoredDistributions(rowHandler);
  const auto& rows = waiting_->distributions();
  auto next = rows.begin();
  bool isStopped = false;
  Status status = Done{};
  const auto passNext = [&](std::int64_t storedCount, BHHistoryDistributionEnumerator* stored) {
    const WaitingValues::Series& series = next->second;
    JoinedEnumerator values(stored, *waiting_, series);
    rowHandler(next->first.second, next->first.first, storedCount + series.count, values,
               isStopped);
    status = values.status();
    if (!status) isStopped = true;
    ++next;
  };
  const auto passBefore = [&](const auto& isBefore) {
    while (!isStopped && next != rows.end() && isBefore(next->first))
      passNext(0, nullptr);
  };
  const Status walked =
      walkStoredDistributions([&](std::string_view key, std::int32_t day, std::int64_t count,
                                  BHHistoryDistributionEnumerator& values, bool& stop) {
        const std::pair name(day, key);
        passBefore([&](const RowName& row) { return LessRowName()(row, name); });
        if (!isStopped) {
          if (next != rows.end() && !LessRowName()(name, next->first)) {
            passNext(count, &values);
          } else {
            rowHandler(key, day, count, values, isStopped);
          }
        }
        stop = isStopped;
      });
  if (walked) passBefore([](const RowName&) { return true; });
  return walked ? status : walked;
}

Expected<std::optional<SqliteHistory::DaySpan>> RecordedHistory::daysHeld() {
  std::optional<SqliteHistory::DaySpan> span;
  if (stored_) {
    const auto held = stored_->daysHeld();
    if (!held) return held.error();
    span = *held;
  }
  if (waiting_) {
    extend(span, waiting_->scalars());
    extend(span, waiting_->distributions());
  }
  return span;
}

}  // namespace tavrel
