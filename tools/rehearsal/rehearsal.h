// A daily run that changes nothing, recorded step by step.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "report/log_outcome.h"
#include "tools/overlay/overlay_events.h"

namespace tavrel {

class LinuxPlatform;

enum class RehearsedRun : std::uint8_t {
  Gated,   // yesterday, unless already done
  Forced,  // yesterday in any case
  Today,   // today
};

struct RehearsedStep {
  std::string title;
  std::vector<OverlayEvent> events;  // never empty
};

struct Rehearsal {
  std::int32_t day;
  std::vector<RehearsedStep> steps;
  std::optional<LogOutcome> logOutcome;    // nothing when the gate stopped the run
  std::vector<std::string> missingValues;  // which waiting ones could not be read, for people
};

/// Plays the daemon's own run over the device.
Rehearsal rehearse(LinuxPlatform& device, RehearsedRun run);

}  // namespace tavrel
