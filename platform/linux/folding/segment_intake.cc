#include "platform/linux/folding/segment_intake.h"

#include "base/keyed_hash.h"
#include "base/limits.h"
#include "client/segment_format.h"

namespace tavrel {
namespace {

// 9999-12-31, the last day with a four-digit year. A clock that was set forward may have shown any
// earlier day.
constexpr std::int32_t kLastDay = 2'932'896;

}  // namespace

FoldedRows::Row* FoldedRows::find(std::uint32_t user, std::int32_t day, std::string_view key,
                                  bool isScalar) {
  // The odd factor keeps a key's days and its two kinds apart.
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

SegmentIntake::Series* SegmentIntake::findSeries(const SegmentRecord& record) {
  const auto [found, isNew] = series_.try_emplace({record.keyNumber, record.day}, nullptr);
  if (isNew && mayTake(*record.key, record.day) &&
      rows_.find(user_, record.day, *record.key, false) != nullptr) {
    found->second = &distributions_.series(record.day, *record.key);
  }
  return found->second;
}

void SegmentIntake::takeRecord(const SegmentRecord& record) {
  if (recent_.empty()) recent_.resize(kBHKeys + 1);
  RecentSeries& recent = recent_[record.keyNumber];
  if (recent.day != record.day || !recent.isKnown) {
    recent = {record.day, true, findSeries(record)};
  }
  if (recent.series == nullptr) return void(++refused_);
  ++values_;
  distributions_.append(*recent.series, record.value, record.secondsInDay);
}

}  // namespace tavrel
