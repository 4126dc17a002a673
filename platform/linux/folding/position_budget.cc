#include "platform/linux/folding/position_budget.h"

#include "platform/linux/segments/segment_position.h"

namespace tavrel {

Status PositionBudget::load(SqliteBatch& batch) {
  if (isLoaded_) return Done{};
  const auto names = batch.segmentNames();
  if (!names) return names.error();
  known_.insert(names->begin(), names->end());
  for (const SegmentName& name : known_)
    ++count_[name.owner];
  isLoaded_ = true;
  return Done{};
}

bool PositionBudget::admit(const SegmentName& name) {
  if (known_.contains(name)) return true;
  if (count_[name.owner] >= limits::kSegmentsPerUser) return false;
  ++count_[name.owner];
  return true;
}

Expected<bool> PositionBudget::hasRoom(SqliteBatch& batch, std::uint32_t owner, std::size_t before,
                                       std::size_t most) {
  if (most <= before) return true;
  auto known = bytes_.find(owner);
  if (known == bytes_.end()) {
    const auto bytes = batch.segmentPositionBytes(owner);
    if (!bytes) return bytes.error();
    known = bytes_.emplace(owner, *bytes).first;
  }
  return known->second + static_cast<std::int64_t>(most - before) <=
         std::int64_t{limits::kPositionBytesPerUser};
}

Status PositionBudget::store(SqliteBatch& batch, const SegmentName& name, const std::string& before,
                             const std::string& after) {
  if (after == before) return Done{};
  if (Status done = batch.setSegmentPosition(name.owner, name.identity, after); !done) return done;
  addBytes(name.owner, std::ssize(after) - std::ssize(before));
  return Done{};
}

Status PositionBudget::removeEnd(SqliteBatch& batch, const SegmentName& name) {
  if (Status done = batch.removeSegmentPosition(name.owner, name.identity); !done) return done;
  --count_[name.owner];
  addBytes(name.owner, -std::ssize(SegmentPosition::end().encode()));
  return Done{};
}

void PositionBudget::addBytes(std::uint32_t owner, std::int64_t bytes) {
  if (const auto known = bytes_.find(owner); known != bytes_.end()) known->second += bytes;
}

}  // namespace tavrel
