#include "tools/stat/collect.h"

#include <algorithm>
#include <chrono>
#include <ostream>
#include <string>

#include "base/format.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/folding/segment_folder.h"
#include "tools/console/end_signals.h"
#include "tools/console/table.h"
#include "tools/stat/collector.h"
#include "tools/stat/single_readings.h"
#include "tools/stat/stat_progress.h"
#include "tools/stat/value_recorder.h"

namespace tavrel {
namespace {

using Ticks = CollectPace::Ticks;

// Only the latest number of processes is kept, so most readings leave it out.
constexpr std::uint64_t kSecondsPerCount = 60;

class UntilSignal final : public CollectPace {
 public:
  Ticks now() override { return std::chrono::steady_clock::now(); }
  bool endsBefore(Ticks end) override { return signals_.arriveBefore(end); }

 private:
  EndSignals signals_;  // sampled values are kept when one arrives
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
  UntilSignal signals;
  collectStatistics(context, seconds, signals);
}

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
  UntilSignal signals;
  collectEvery(context, period, stateFile, signals);
}

}  // namespace tavrel
