#include "platform/linux/runs/run_memory.h"

#include <utility>

#include "base/parse_number.h"
#include "platform/persisted_state.h"

namespace tavrel {

RunMemory::RunMemory(DeviceRoot root, Clock& clock, SystemLog& log, std::optional<RunKind> kind)
    : root_(std::move(root)), clock_(clock), log_(log) {
  run_.began = clock_.now();
  run_.kind = kind;
}

void RunMemory::write(LogLevel level, std::string_view message) {
  log_.write(level, message);
  if (level == LogLevel::Error) {
    run_.addError(message);
  } else if (level == LogLevel::Default && message.starts_with(kTasksBegin)) {
    message.remove_prefix(kTasksBegin.size());
    if (const auto day = parseNumber<std::int64_t>(message)) begin(*day);
  }
}

void RunMemory::begin(std::int64_t day) {
  run_.day = day;
  save();
}

void RunMemory::finish() {
  if (!run_.day && run_.errorCount == 0) return;
  run_.isFinished = true;
  run_.ended = clock_.now();
  if (run_.day) run_.lastFinished = run_.ended;
  save();
}

void RunMemory::save() {
  if (!std::exchange(isEarlierKnown_, true)) {
    run_.process = ProcessIdentity::ofThis();
    const auto earlier = LastRun::read(root_, files_);
    if (earlier && *earlier) run_.lastFinished = (*earlier)->lastFinished;
  }
  if (const Status written = run_.write(root_, files_); !written) {
    log_.log(LogLevel::Error, "this run will not be remembered: %s", written.error().message);
  }
}

}  // namespace tavrel
