#include "tools/stat/collect.h"

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cmath>
#include <csignal>
#include <optional>
#include <ostream>
#include <set>
#include <string>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

#include "base/arithmetic.h"
#include "base/format.h"
#include "platform/linux/files/boot_id.h"
#include "platform/linux/files/descriptor.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/folding/segment_folder.h"
#include "platform/system_log.h"
#include "tools/shared/table.h"
#include "tools/stat/collect_sources.h"
#include "tools/stat/collect_state.h"
#include "tools/stat/machine_statistics.h"
#include "tools/stat/stat_progress.h"
#include "tools/stat/value_recorder.h"

namespace tavrel {
namespace {

using Ticks = CollectPace::Ticks;

constexpr std::size_t kReadingsPerTransaction = 60;

// Only the latest number of processes is kept, so most readings leave it out.
constexpr std::uint64_t kSecondsPerCount = 60;

class NotingLog final : public SystemLog {
 public:
  explicit NotingLog(ToolContext& context) : context_(context) {}
  void write(LogLevel, std::string_view message) override { context_.note(message); }

 private:
  ToolContext& context_;
};

// Reads the machine, and computes values from each reading and the previous one.
class Collector {
 public:
  Collector(ToolContext& context, ValueRecorder& recorder, std::uint64_t readingsPerCount)
      : log_(context),
        sources_(context.root(), log_),
        recorder_(recorder),
        readingsPerCount_(readingsPerCount) {}

  void startFrom(std::optional<CollectState> last) { last_ = std::move(last); }

  void read(std::chrono::nanoseconds at, ValueTime time) {
    const auto processes =
        count_ % readingsPerCount_ == 0 ? Processes::Counted : Processes::LeftOut;
    CollectState now{.at = at, .machine = sources_.read(processes), .remainders = {}};
    const MachineReading* const before = last_ ? &last_->machine : nullptr;
    const double secondsBetween = last_ ? std::chrono::duration<double>(at - last_->at).count() : 0;
    if (waiting_ == 0) before_ = last_;
    if (last_) now.remainders = std::move(last_->remainders);
    for (const MachineStatistic& statistic : machineStatistics()) {
      const auto value = statistic.measure(now.machine, before, secondsBetween);
      if (value) values_.push_back({time, &statistic, kept(statistic, *value, now)});
    }
    last_ = std::move(now);
    ++count_;
    ++waiting_;
  }

  bool hasWaiting() const { return waiting_ > 0; }
  /// The earliest day to which values belong that wait; there must be some.
  std::int32_t firstDay() const { return values_.front().time.day; }
  bool isInMemory() const { return recorder_.isInMemory(); }
  /// Whether it is time to keep the values.
  bool isFull() const { return recorder_.isInMemory() || waiting_ >= kReadingsPerTransaction; }

  /// After a failure the values still wait, unless memory has taken them.
  Status keep() {
    for (const TimedValue& value : values_) {
      told_.insert(value.statistic->key);
      if (Status done = keepValue(value); !done) return done;
    }
    Status done = recorder_.keep();
    if (!done && !isInMemory()) return done;
    values_.clear();
    waiting_ = 0;
    return done;
  }

  /// The last reading; there must have been one.
  const CollectState& state() const { return *last_; }
  /// The reading before those that wait, if there was one.
  const std::optional<CollectState>& stateBefore() const { return before_; }
  std::uint64_t count() const { return count_; }

  /// Statistics that no reading has provided so far, each preceded by a blank.
  std::string missing() const {
    std::string keys;
    for (const MachineStatistic& statistic : machineStatistics()) {
      if (!told_.contains(statistic.key)) keys.append(" ").append(statistic.key);
    }
    return keys;
  }

 private:
  struct TimedValue {
    ValueTime time;
    const MachineStatistic* statistic;
    double value;
  };

  // The value to keep: of a sum, the whole part; the next reading gets the rest.
  static double kept(const MachineStatistic& statistic, double value, CollectState& now) {
    if (statistic.keeping != Keeping::Sum) return value;
    double& remainder = now.remainders[statistic.key];
    const double sum = value + remainder;
    const double whole = std::floor(sum);
    remainder = sum - whole;
    return whole;
  }

  Status keepValue(const TimedValue& given) {
    const auto& [time, statistic, value] = given;
    switch (statistic->keeping) {
      case Keeping::Latest:
        return recorder_.set(time, statistic->key, saturatingInt64(value));
      case Keeping::Sum:
        return recorder_.add(time, statistic->key, saturatingInt64(value));
      case Keeping::Series:
        return recorder_.append(time, statistic->key, value);
    }
    return Done{};
  }

  NotingLog log_;
  MachineSources sources_;
  ValueRecorder& recorder_;
  const std::uint64_t readingsPerCount_;
  std::optional<CollectState> last_;
  std::optional<CollectState> before_;
  std::vector<TimedValue> values_;
  std::size_t waiting_ = 0;  // readings
  std::uint64_t count_ = 0;
  std::set<std::string_view> told_;
};

// Blocks SIGINT and SIGTERM during its lifetime, so that sampled values are kept when they arrive.
class EndSignals final : public CollectPace {
 public:
  EndSignals() {
    sigemptyset(&signals_);
    sigaddset(&signals_, SIGINT);
    sigaddset(&signals_, SIGTERM);
    pthread_sigmask(SIG_BLOCK, &signals_, &before_);
  }
  ~EndSignals() override {
    // Discard signals that arrived since: they asked for the end that this is.
    while (waitForOne(Ticks())) {
    }
    pthread_sigmask(SIG_SETMASK, &before_, nullptr);
  }
  EndSignals(const EndSignals&) = delete;
  EndSignals& operator=(const EndSignals&) = delete;

  Ticks now() override { return std::chrono::steady_clock::now(); }
  bool endsBefore(Ticks end) override { return waitForOne(end); }

 private:
  bool waitForOne(Ticks end) const {
    for (;;) {
      const auto left = std::max(end - std::chrono::steady_clock::now(), Ticks::duration::zero());
      const auto seconds = std::chrono::floor<std::chrono::seconds>(left);
      const auto rest = std::chrono::nanoseconds(left - seconds).count();
      const timespec wait{.tv_sec = seconds.count(), .tv_nsec = static_cast<long>(rest)};
      if (sigtimedwait(&signals_, nullptr, &wait) > 0) return true;
      if (errno != EINTR) return false;
    }
  }

  sigset_t signals_;
  sigset_t before_;
};

}  // namespace

void collectStatistics(ToolContext& context, std::uint32_t seconds, CollectPace& pace) {
  const auto recorder = openRecorder(context);
  if (!recorder) return context.fail(recorder.error().message);
  Collector collector(context, **recorder, kSecondsPerCount);
  const Ticks start = pace.now();
  std::uint32_t second = 0;
  bool endsEarly = false;
  Status kept = Done{};
  {
    StatProgress progress(context);
    for (;; ++second) {
      collector.read(pace.now().time_since_epoch(), valueTimeAt(pace.wallTime()));
      progress.show(format("collecting: %u of %u seconds", second, seconds));
      const bool isLast = second == seconds;
      // Keep the values before the wait: a reading counts for the day on which it is made.
      if (isLast || collector.isFull()) kept = collector.keep();
      if (isLast || !kept) break;
      endsEarly = pace.endsBefore(start + std::chrono::seconds(second + 1));
      if (!endsEarly) continue;
      kept = collector.keep();
      break;
    }
  }
  if (!kept) return context.fail(kept.error().message);
  context.out() << "kept " << counted(collector.count(), "sample")
                << " of this machine, taken over " << counted(second, "second") << '\n';
  if (endsEarly) context.note(format("ended by a signal before %u seconds were over", seconds));
  // A single reading gives no rates, which needs no message.
  if (const std::string keys = collector.missing(); collector.count() > 1 && !keys.empty()) {
    context.note("not recorded, no reading available:" + keys);
  }
}

void collectStatistics(ToolContext& context, std::uint32_t seconds) {
  EndSignals signals;
  collectStatistics(context, seconds, signals);
}

namespace {

// Takes single readings; each continues from the previous reading, which a file holds between runs.
class SingleReadings {
 public:
  SingleReadings(ToolContext& context, ValueRecorder& recorder, const std::string& stateFile)
      : context_(context),
        path_(stateFile.empty() ? context.root().path("/run/tavrel/collect.state") : stateFile),
        boot_(bootIDOf(context.root())),
        collector_(context, recorder, 1) {}

  /// Fails when readings of another process wait.
  Status take(std::chrono::nanoseconds now, ValueTime time) {
    if (!collector_.hasWaiting()) {
      if (Status locked = lock(); !locked) return locked;
      // Another process may have taken a reading since the last one was left.
      if (!hasLostState_) startFromState(now);
      waitingSince_ = now;
    }
    collector_.read(now, time);
    return Done{};
  }

  /// Whether values for the store may wait for a next reading at `next`: fewer transactions are
  /// less wear. They do not wait into the next day, whose first run reports them.
  bool mayWait(std::chrono::nanoseconds next, ValueTime nextTime) const {
    return !collector_.isInMemory() && nextTime.day == collector_.firstDay() &&
           next - waitingSince_ < kLongestWait;
  }

  /// Fails when the state cannot be left to the next process.
  Status keep() { return keep(nullptr); }
  /// Keeps the values even then.
  Status keepAtEnd() {
    return keep("the samples are kept, but the next process has no rates at first");
  }

  /// As `keep`, but values that the store does not take wait for the next reading, up to an hour
  /// longer than others.
  Status keepOrWait(std::chrono::nanoseconds now) {
    Status kept = keep("sampling goes on, but after a restart the first sample has no rates");
    const bool waits = !kept && !collector_.isInMemory() && now - waitingSince_ < 2 * kLongestWait;
    if (waits && !isHeldUp_) {
      context_.note(
          format("%s; the samples wait, and the next one tries again", kept.error().message));
    }
    isHeldUp_ = waits;
    return waits ? Done{} : kept;
  }

 private:
  static constexpr std::chrono::hours kLongestWait{1};

  // Locks the state as long as readings wait: another process would continue from the same state,
  // and count what happened since then again. Where there can be no lock, there can be no state.
  Status lock() {
    const std::string path = path_ + ".lock";
    auto lock = FileSystem().lockFile(
        path, {.milliseconds = 2000,
               .advice = "it may be a sampler whose samples wait for the store: stop it first"});
    if (!lock) return FileSystem::status(path) ? Status(lock.error()) : Done{};
    lock_ = *std::move(lock);
    return Done{};
  }

  /// `withoutState`: what follows when the state cannot be written; null when nothing is kept then.
  Status keep(const char* withoutState) {
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
  void restoreState() const {
    const auto& before = collector_.stateBefore();
    if (!before || !writeCollectState(path_, boot_, *before)) removeState();
  }

  // From an older reading, a later process would count again what is kept now. On a read-only file
  // system, unlink does not say that there is no such file.
  bool removeState() const {
    struct stat status {};
    return unlink(path_.c_str()) == 0 ||
           (lstat(path_.c_str(), &status) != 0 && (errno == ENOENT || errno == ENOTDIR));
  }

  void startFromState(std::chrono::nanoseconds now) {
    auto before = readCollectState(path_, boot_, now);
    if (!before) {
      context_.note(format("this sample has no rates: %s", before.error().message));
      collector_.startFrom(std::nullopt);
    } else {
      collector_.startFrom(std::move(*before));
    }
  }

  ToolContext& context_;
  const std::string path_;
  const std::string boot_;
  Collector collector_;
  Descriptor lock_;
  std::chrono::nanoseconds waitingSince_{};
  bool hasLostState_ = false;
  bool isHeldUp_ = false;  // by a store that takes no values
};

}  // namespace

void collectOnce(ToolContext& context, const std::string& stateFile) {
  const auto recorder = openRecorder(context);
  if (!recorder) return context.fail(recorder.error().message);
  SingleReadings readings(context, **recorder, stateFile);
  Status done = readings.take(std::chrono::steady_clock::now().time_since_epoch(), valueTimeNow());
  if (done) done = readings.keep();
  if (!done) context.fail(done.error().message);
}

void collectEvery(ToolContext& context, std::chrono::seconds period, const std::string& stateFile,
                  CollectPace& pace) {
  const auto recorder = openRecorder(context);
  if (!recorder) return context.fail(recorder.error().message);
  const std::string folder = context.root().path(kSegmentFolder);
  const auto hasFolder = [&] { return FileSystem::status(folder).has_value(); };
  const bool isInStore = !(*recorder)->isInMemory();
  const bool lacksFolder = isInStore && !hasFolder();
  if (isInStore) {
    context.note(format("%s: samples go into the store, on flash, once an hour: %s", folder,
                        lacksFolder ? "no such folder; start tavrel-folders.service"
                                    : "not in memory; mount a tmpfs there and start again"));
  }
  SingleReadings readings(context, **recorder, stateFile);
  Status kept = Done{};
  bool isReplaced = false;
  for (Ticks due = pace.now(); kept && !isReplaced && !pace.endsBefore(due);
       due = std::max(due + period, pace.now())) {
    const auto now = pace.now().time_since_epoch();
    const auto wallTime = pace.wallTime();
    kept = readings.take(now, valueTimeAt(wallTime));
    if (kept && !readings.mayWait(now + period, valueTimeAt(wallTime + period))) {
      kept = readings.keepOrWait(now);
    }
    isReplaced = lacksFolder && hasFolder();
  }
  if (kept) kept = readings.keepAtEnd();
  if (!kept) return context.fail(kept.error().message);
  if (isReplaced) {
    context.fail(format("%s is there now: start again to record in memory", folder));
  }
}

void collectEvery(ToolContext& context, std::chrono::seconds period, const std::string& stateFile) {
  EndSignals signals;
  collectEvery(context, period, stateFile, signals);
}

}  // namespace tavrel
