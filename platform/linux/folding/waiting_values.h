// Recorded values that no fold has taken yet, for viewers of the store. Reading changes nothing in
// the segments.
#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "base/expected.h"
#include "platform/linux/files/descriptor.h"
#include "platform/linux/folding/position_budget.h"
#include "platform/linux/folding/recorders.h"
#include "platform/linux/folding/scalar_changes.h"
#include "platform/linux/folding/segment_folder.h"
#include "platform/linux/folding/segment_intake.h"
#include "platform/linux/store/sqlite_history.h"

namespace tavrel {

/// Which rows are wanted.
struct RowSelection {
  std::string key;
  bool isPrefix = true;  // `key` is a prefix, not one whole key
  std::int32_t firstDay = 0;
  std::int32_t lastDay = 0;  // included
  bool hasValues = true;     // whether measurements or only their count are wanted

  bool operator==(const RowSelection&) const = default;

  bool contains(std::int32_t day, std::string_view name) const {
    return day >= firstDay && day <= lastDay && (isPrefix ? name.starts_with(key) : name == key);
  }
};

class WaitingValues {
 public:
  /// Where the measurements of one row are among the copied ones.
  struct Series {
    struct Block {
      std::uint64_t first;  // index among all copied measurements
      std::uint64_t count;
    };
    /// A reading position: the block of the next measurement, and its index there.
    struct Place {
      std::size_t block = 0;
      std::uint64_t offset = 0;
    };
    std::vector<Block> blocks;
    std::int64_t count = 0;
  };

  /// Reads all segments that this user may read, each from the position in `history`, or from its
  /// start without a history.
  static Expected<WaitingValues> read(const SegmentFolder& folder, const Recorders& recorders,
                                      SqliteHistory* history, const RowSelection& selection);

  const RowMap<ScalarChanges::Change>& scalars() const { return scalars_.rows(); }
  const RowMap<Series>& distributions() const { return distributions_; }
  /// Segments that were left out because of a limit, or because another version of this program
  /// began to fold them.
  std::uint64_t leftOut() const { return leftOut_; }
  /// Segments with selected values that no fold takes while the users' rights are unknown.
  std::uint64_t withoutRights() const { return withoutRights_; }

  /// The next measurements of the row, at most as many as fit; 0 at its end. Moves `place` past
  /// them.
  Expected<std::size_t> readSeries(const Series& series, Series::Place& place,
                                   std::span<DistributionSample> into) const;

 private:
  WaitingValues() = default;
  Status add(const OpenSegment& segment, const Recorders& recorders, SqliteHistory* history,
             const RowSelection& selection, SegmentNames& found, FoldedRows& rows,
             PendingDistributions& buffer);
  Status addSeries(const RowSelection& selection, std::int32_t day, std::string_view key,
                   const DistributionBlock& block);

  ScalarChanges scalars_;
  RowMap<Series> distributions_;
  std::uint64_t leftOut_ = 0;
  std::uint64_t withoutRights_ = 0;
  // Measurements in the order of segments, in an unmapped memory file.
  Descriptor copied_;
  std::uint64_t copies_ = 0;
  std::size_t blocks_ = 0;
};

}  // namespace tavrel
