#include "platform/linux/system_log/refusal_log.h"

#include "base/limits.h"
#include "platform/guarded.h"

namespace tavrel {

RefusalLog::~RefusalLog() {
  runGuarded(log_, "log how many refusals were left out", [this] { sayLeftOut(); });
}

void RefusalLog::sayLeftOut() {
  if (leftOut_ > 0) log_.log(LogLevel::Default, "%d more refusals were not logged", leftOut_);
  leftOut_ = 0;
}

void RefusalLog::write(std::string_view line) {
  const auto now = std::chrono::steady_clock::now();
  if (now - minuteBegan_ >= std::chrono::minutes(1)) {
    sayLeftOut();
    minuteBegan_ = now;
    written_ = 0;
  }
  if (written_ == limits::kRefusalLinesPerMinute) {
    ++leftOut_;
    return;
  }
  ++written_;
  log_.write(LogLevel::Default, line);
}

}  // namespace tavrel
