#include "platform/linux/folding/folding_store.h"

#include "platform/guarded.h"

namespace tavrel {

bool FoldingStore::BHClientCheckpoint() {
  runGuarded(log_, "fold what programs recorded", [this] {
    const FoldReport report = fold_.run();
    if (!report.failure || *report.failure == toldFailure_) return;
    log_.write(LogLevel::Error, *report.failure);
    toldFailure_ = *report.failure;
  });
  return store_.BHClientCheckpoint();
}

}  // namespace tavrel
