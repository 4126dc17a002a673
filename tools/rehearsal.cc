#include "tools/rehearsal.h"

#include "base/arithmetic.h"
#include "daemon/daily_run.h"
#include "platform/linux/linux_platform.h"
#include "tools/overlay_platform.h"

namespace tavrel {
namespace {

using Kind = OverlayEvent::Kind;

bool isFirst(const OverlayEvent&) {
  return false;
}

template <Kind kind>
bool is(const OverlayEvent& event) {
  return event.kind == kind;
}

// A step and the event that nothing before it can cause.
struct StepOpening {
  std::string_view title;
  bool (*opens)(const OverlayEvent& event);
};

// In the order of the run, which never goes back.
constexpr StepOpening kSteps[] = {
    {"Once-a-day gate", isFirst},
    {"Checkpoint of the statistics store",
     [](const OverlayEvent& event) {
       return event.kind == Kind::LogLine &&
              event.value.string().value_or("").starts_with("daily tasks for day");
     }},
    {"Report",
     [](const OverlayEvent& event) {
       return event.kind == Kind::Preference &&
              event.subject == "com.norvane.zentrix DiagnosticSubmissionEnabled";
     }},
    {"Disk space",
     [](const OverlayEvent& event) {
       return event.kind == Kind::Answer && event.subject == "DiskUsage";
     }},
    {"Structured storage log and NAND information", is<Kind::Driver>},
    {"ECC events",
     [](const OverlayEvent& event) {
       return event.kind == Kind::Control && event.subject == "kern.next_ecc_event";
     }},
    {"Report channels", is<Kind::Drivers>},
    {"Clean-up of structured records", is<Kind::CleanUp>},
    {"Changes of the system, and tasking",
     [](const OverlayEvent& event) {
       return event.kind == Kind::Fact && event.subject == "system version";
     }},
    {"Roll-over of the support log", is<Kind::RollOver>},
    {"End of the gated run", is<Kind::Checkpoint>},
};

/// Files events under the step that they belong to.
class StepRecorder {
 public:
  void record(const OverlayEvent& event) {
    for (std::size_t step = current_ + 1; step < std::size(kSteps); ++step) {
      // The store is checkpointed at the start too; the last step is the one behind the roll-over.
      const bool isLast = step + 1 == std::size(kSteps);
      if (isLast && current_ + 2 != std::size(kSteps)) break;
      if (!kSteps[step].opens(event)) continue;
      current_ = step;
      break;
    }
    if (steps.empty() || steps.back().title != kSteps[current_].title) {
      steps.push_back({kSteps[current_].title, {}});
    }
    steps.back().events.push_back({event.kind, event.subject, deepCopy(event.value)});
  }

  std::vector<RehearsedStep> steps;

 private:
  std::size_t current_ = 0;
};

}  // namespace

Rehearsal rehearse(LinuxPlatform& device, RehearsedRun run) {
  OverlayPlatform overlay(device);
  StepRecorder recorder;
  overlay.setEventHandler([&recorder](const OverlayEvent& event) { recorder.record(event); });
  Platform& platform = overlay.platform();
  const std::int32_t today = platform.statistics.BHDaysSince1970();
  const std::int32_t day = run == RehearsedRun::Today ? today : previousDay(today);
  if (run == RehearsedRun::Gated) {
    runDailyIfNeeded(platform, {});
  } else {
    dailyTasksForDay(platform, day, {});
  }
  return {day, std::move(recorder.steps)};
}

}  // namespace tavrel
