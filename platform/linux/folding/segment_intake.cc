#include "platform/linux/folding/segment_intake.h"

#include "base/keyed_hash.h"
#include "base/limits.h"
#include "client/segment_format.h"

namespace tavrel {
namespace {

// 9999-12-31, the last day that has a date of the usual form. A clock that was set forward may have
// shown any day before.
constexpr std::int32_t kLastDay = 2'932'896;

}  // namespace

FoldedRows::Row* FoldedRows::find(std::uint32_t user, std::int32_t day, std::string_view key,
                                  bool isScalar) {
  // An odd factor keeps the days of one key apart, and its kinds.
  const std::uint64_t name =
      keyedHash(key) + (std::uint64_t{static_cast<std::uint32_t>(day)} * 2 + (isScalar ? 1 : 0)) *
                           0x9E3779B97F4A7C15U;
  if (const auto found = rows_.find(name); found != rows_.end()) return &found->second;
  std::size_t& count = counts_[user];
  if (rows_.size() >= limits::kFoldRows || count >= limits::kFoldRowsPerUser) return nullptr;
  ++count;
  return &rows_[name];
}

bool SegmentIntake::mayTake(std::string_view key, std::int32_t day) {
  if (!recorders_.mayRecord(user_, key)) {
    if (foreignKey_.empty()) foreignKey_ = key;
    return false;
  }
  return day >= 0 && day <= kLastDay;
}

void SegmentIntake::takeScalar(const SegmentScalar& scalar) {
  FoldedRows::Row* const row =
      mayTake(scalar.key, scalar.day) ? rows_.find(user_, scalar.day, scalar.key, true) : nullptr;
  if (row == nullptr) return void(++refused_);
  ++scalars_;
  if (!scalar.isSet) {
    std::int64_t sum = 0;
    if (!__builtin_add_overflow(row->added, scalar.value, &sum)) row->added = sum;
    return changes_.add(scalar.day, scalar.key, scalar.value);
  }
  if (scalar.setTime < row->latestSet) return;
  row->latestSet = scalar.setTime;
  changes_.set(scalar.day, scalar.key, scalar.value, row->added);
}

std::uint32_t SegmentIntake::findSeries(const SegmentRecord& record) {
  const auto [found, isNew] = places_.try_emplace({record.keyNumber, record.day},
                                                  static_cast<std::uint32_t>(series_.size()));
  if (isNew) {
    const bool isTaken = mayTake(record.key, record.day) &&
                         rows_.find(user_, record.day, record.key, false) != nullptr;
    series_.push_back({record.key, record.day, !isTaken});
  }
  return found->second;
}

void SegmentIntake::takeRecord(const SegmentRecord& record) {
  if (recent_.empty()) recent_.resize(kBHKeys + 1);
  RecentSeries& recent = recent_[record.keyNumber];
  if (recent.day != record.day || recent.place == kNone) {
    recent = {record.day, findSeries(record)};
  }
  Series& series = series_[recent.place];
  if (series.isRefused) return void(++refused_);
  ++series.count;
  buffers_.recorded_.push_back({record.value, record.secondsInDay, recent.place});
}

std::span<const DistributionSample> SegmentIntake::samplesBySeries() const {
  std::vector<std::size_t> next;  // of each series, the place of its next sample
  next.reserve(series_.size());
  std::size_t count = 0;
  for (const Series& series : series_) {
    next.push_back(count);
    count += series.count;
  }
  std::vector<DistributionSample>& sorted = buffers_.bySeries_;
  if (sorted.size() < count) sorted.resize(count);
  for (const SampleBuffers::Sample& sample : buffers_.recorded_)
    sorted[next[sample.series]++] = {sample.value, sample.secondsInDay};
  return std::span(sorted).first(count);
}

}  // namespace tavrel
