// The checks, grouped by subject. Each function adds one or more checks to the list.
#pragma once

#include <string_view>
#include <vector>

#include "base/plist.h"
#include "tools/check/check.h"

namespace tavrel {

/// What all checks share.
struct CheckScene {
  ToolContext& context;
  std::int64_t now = 0;    // seconds since 1970
  std::int32_t today = 0;  // UTC
  std::chrono::milliseconds examination{};
  std::vector<Check>& checks;

  std::int64_t ageOf(std::int64_t seconds) const { return seconds < now ? now - seconds : 0; }
  std::int64_t ageOf(plist::Date date) const;
};

/// Makes a check at least as grave as `state` and extends its text, which stays on one line.
void addFinding(Check& check, CheckState state, std::string_view text);

void checkPermission(CheckScene& scene);
void checkClock(CheckScene& scene);
void checkLastRun(CheckScene& scene);
void checkLastLog(CheckScene& scene);
void checkStore(CheckScene& scene);
/// Limits that were reached, values that were lost, and whether folding is behind.
void checkRecording(CheckScene& scene);
void checkQueues(CheckScene& scene);
void checkUpload(CheckScene& scene);
void checkDisks(CheckScene& scene);

}  // namespace tavrel
