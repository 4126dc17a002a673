// What the store remembers of segments, and how much that may be for each user.
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <set>
#include <string>
#include <utility>

#include "base/expected.h"
#include "base/limits.h"
#include "platform/linux/store/sqlite_batch.h"
#include "platform/linux/store/sqlite_segments.h"

namespace tavrel {

struct LessSegmentName {
  bool operator()(const SegmentName& a, const SegmentName& b) const {
    return std::pair(a.owner, a.identity) < std::pair(b.owner, b.identity);
  }
};
using SegmentNames = std::set<SegmentName, LessSegmentName>;

/// Lives as long as one fold; the operations belong to the fold's current transaction.
class PositionBudget {
 public:
  /// Reads which segments have positions. Call it first.
  Status load(SqliteBatch& batch);

  /// The segments that had positions when the fold began.
  const SegmentNames& known() const { return known_; }
  /// Whether a segment has a position, or its user has few enough that it may get one. That one
  /// then counts.
  bool admit(const SegmentName& name);
  /// Whether the user has more than half of the positions allowed.
  bool isHalfUsed(std::uint32_t owner) { return count_[owner] > limits::kSegmentsPerUser / 2; }
  /// Whether a position of the user may grow from `before` to `most` bytes.
  Expected<bool> hasRoom(SqliteBatch& batch, std::uint32_t owner, std::size_t before,
                         std::size_t most);
  Status store(SqliteBatch& batch, const SegmentName& name, const std::string& before,
               const std::string& after);
  /// Removes the position of a segment that was folded to its end.
  Status removeEnd(SqliteBatch& batch, const SegmentName& name);

 private:
  void addBytes(std::uint32_t owner, std::int64_t bytes);

  SegmentNames known_;
  bool isLoaded_ = false;
  std::map<std::uint32_t, std::size_t> count_;   // of each user
  std::map<std::uint32_t, std::int64_t> bytes_;  // of the users for whom they were needed
};

}  // namespace tavrel
