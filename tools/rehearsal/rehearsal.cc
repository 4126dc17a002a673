#include "tools/rehearsal/rehearsal.h"

#include "base/arithmetic.h"
#include "daemon/daily_run.h"
#include "platform/linux/linux_platform.h"
#include "tools/overlay/overlay_platform.h"

namespace tavrel {
namespace {

/// Assigns events to the step during which they happen.
class StepRecorder {
 public:
  void begin(std::string_view step) { current_ = step; }

  void record(const OverlayEvent& event) {
    if (steps.empty() || steps.back().title != current_) steps.push_back({current_, {}});
    steps.back().events.push_back({event.kind, event.subject, deepCopy(event.value)});
  }

  std::vector<RehearsedStep> steps;

 private:
  std::string current_;
};

}  // namespace

Rehearsal rehearse(LinuxPlatform& device, RehearsedRun run) {
  OverlayPlatform overlay(device);
  StepRecorder recorder;
  overlay.setEventHandler([&recorder](const OverlayEvent& event) { recorder.record(event); });
  Platform& platform = overlay.platform();
  const std::int32_t today = platform.statistics->BHDaysSince1970();
  const std::int32_t day = run == RehearsedRun::Today ? today : previousDay(today);
  const StepObserver onStep = [&recorder](std::string_view step) { recorder.begin(step); };
  const std::optional<LogOutcome> outcome = run == RehearsedRun::Gated
                                                ? runDailyIfNeeded(platform, {}, onStep)
                                                : dailyTasksForDay(platform, day, {}, onStep);
  return {day, std::move(recorder.steps), outcome, overlay.missingValues()};
}

}  // namespace tavrel
