#include "platform/linux/folding/folding_store.h"

#include "platform/guarded.h"

namespace tavrel {

bool FoldingStore::BHClientCheckpoint() {
  isFolded_ = false;
  runGuarded(log_, "fold what programs recorded", [this] {
    const FoldReport report = fold_.run();
    isFolded_ = !report.failure;
    if (!report.failure || *report.failure == toldFailure_) return;
    log_.write(LogLevel::Error, *report.failure);
    toldFailure_ = *report.failure;
  });
  return store_.BHClientCheckpoint();
}

std::unique_ptr<BHHistory> FoldingStore::initWithDefaultPath() {
  auto history = store_.openOrReport();
  if (!isFolded_) history->setIncomplete();
  return history;
}

}  // namespace tavrel
