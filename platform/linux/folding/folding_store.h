// The statistics store of a device whose programs record into segments: each checkpoint folds the
// segments first.
#pragma once

#include <memory>
#include <string>

#include "platform/forwarding_store.h"
#include "platform/linux/folding/segment_fold.h"
#include "platform/linux/store/sqlite_store.h"
#include "platform/system_log.h"

namespace tavrel {

class FoldingStore final : public ForwardingStore {
 public:
  /// All must outlive it.
  FoldingStore(SqliteStore& store, SegmentFold& fold, SystemLog& log)
      : ForwardingStore(store), store_(store), fold_(fold), log_(log) {}

  /// Logs a failed fold once. It does not change the result: the segments keep what they hold.
  bool BHClientCheckpoint() override;
  /// After a failed fold, its queries say that rows are missing: those of the segments.
  std::unique_ptr<BHHistory> initWithDefaultPath() override;

 private:
  SqliteStore& store_;
  SegmentFold& fold_;
  SystemLog& log_;
  bool isFolded_ = true;
  std::string toldFailure_;
};

}  // namespace tavrel
