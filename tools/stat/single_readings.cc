#include "tools/stat/single_readings.h"

#include <cerrno>
#include <optional>
#include <sys/stat.h>
#include <unistd.h>

#include "base/format.h"
#include "platform/linux/files/boot_id.h"
#include "platform/linux/files/file_system.h"
#include "tools/stat/collect_state.h"

namespace tavrel {
namespace {

constexpr std::chrono::hours kLongestWait{1};

}  // namespace

SingleReadings::SingleReadings(ToolContext& context, ValueRecorder& recorder,
                               const std::string& stateFile)
    : context_(context),
      path_(stateFile.empty() ? context.root().path("/run/tavrel/collect.state") : stateFile),
      boot_(bootIDOf(context.root())),
      collector_(context, recorder, 1) {}

Status SingleReadings::take(std::chrono::nanoseconds now, ValueTime time) {
  if (!collector_.hasWaiting()) {
    if (Status locked = lock(); !locked) return locked;
    // Another process may have taken a reading since the last one was left.
    if (!hasLostState_) startFromState(now);
    waitingSince_ = now;
  }
  collector_.read(now, time);
  return Done{};
}

bool SingleReadings::mayWait(std::chrono::nanoseconds next, ValueTime nextTime) const {
  return !collector_.isInMemory() && nextTime.day == collector_.firstDay() &&
         next - waitingSince_ < kLongestWait;
}

Status SingleReadings::keep() {
  return keep(nullptr);
}

Status SingleReadings::keepAtEnd() {
  return keep("the samples are kept, but the next process has no rates at first");
}

Status SingleReadings::keepOrWait(std::chrono::nanoseconds now) {
  Status kept = keep("sampling goes on, but after a restart the first sample has no rates");
  const bool waits = !kept && !collector_.isInMemory() && now - waitingSince_ < 2 * kLongestWait;
  if (waits && !isHeldUp_) {
    context_.note(
        format("%s; the samples wait, and the next one tries again", kept.error().message));
  }
  isHeldUp_ = waits;
  return waits ? Done{} : kept;
}

// Locks the state as long as readings wait: another process would continue from the same state, and
// count what happened since then again. Where there can be no lock, there can be no state.
Status SingleReadings::lock() {
  const std::string path = path_ + ".lock";
  auto lock = FileSystem().lockFile(
      path, {.milliseconds = 2000,
             .advice = "it may be a sampler whose samples wait for the store: stop it first"});
  if (!lock) return FileSystem::status(path) ? Status(lock.error()) : Done{};
  lock_ = *std::move(lock);
  return Done{};
}

Status SingleReadings::keep(const char* withoutState) {
  if (!collector_.hasWaiting()) return Done{};
  // Write the state first: a kill before the values are kept then loses them. In the other order,
  // the next reading would count them twice.
  const Status left = writeCollectState(path_, boot_, collector_.state());
  if (!left) {
    if (withoutState == nullptr || !removeState()) return left;
    if (!hasLostState_) context_.note(format("%s; %s", left.error().message, withoutState));
  }
  hasLostState_ = !left;
  Status kept = collector_.keep();
  if (!kept && !collector_.isInMemory()) restoreState();
  if (!collector_.hasWaiting()) lock_.reset();
  return kept;
}

// The next process, which lacks the values that wait, then adds their sums to its own. When that
// fails, they are lost with this process.
void SingleReadings::restoreState() const {
  const auto& before = collector_.stateBefore();
  if (!before || !writeCollectState(path_, boot_, *before)) removeState();
}

// From an older reading, a later process would count again what is kept now. On a read-only file
// system, unlink does not say that there is no such file.
bool SingleReadings::removeState() const {
  struct stat status {};
  return unlink(path_.c_str()) == 0 ||
         (lstat(path_.c_str(), &status) != 0 && (errno == ENOENT || errno == ENOTDIR));
}

void SingleReadings::startFromState(std::chrono::nanoseconds now) {
  auto before = readCollectState(path_, boot_, now);
  if (!before) {
    context_.note(format("this sample has no rates: %s", before.error().message));
    collector_.startFrom(std::nullopt);
  } else {
    collector_.startFrom(std::move(*before));
  }
}

}  // namespace tavrel
