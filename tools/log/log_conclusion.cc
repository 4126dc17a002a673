#include "tools/log/log_conclusion.h"

#include <nlohmann/json.hpp>

#include "base/arithmetic.h"
#include "platform/persisted_state.h"
#include "platform/platform.h"
#include "tools/shared/day_argument.h"

namespace tavrel {

std::string LogConclusion::text() const {
  if (!day) return "none yet";
  if (!outcome) return format("day %s, outcome unknown", dayText(*day));
  return logOutcomeText(*outcome, dayText(*day));
}

Json LogConclusion::json() const {
  return {{"run", run()},
          {"day", day ? Json(*day) : Json(nullptr)},
          {"date", day ? Json(dayDateText(*day)) : Json(nullptr)},
          {"outcome", outcome ? Json(nameOf(*outcome)) : Json(nullptr)}};
}

LogConclusion concludeOnLogs(ToolContext& context) {
  Platform& platform = context.platform();
  Preferences& preferences = platform.preferences;
  bool hasRun = false;
  const std::int32_t lastDay =
      lowInt32(preferences.ZTXPreferencesGetIntegerValue(kLastRunDayKey, kTavrelDomain, &hasRun));
  LogConclusion conclusion;
  if (const auto obstacle = obstacleToLog(platform)) {
    const std::int32_t today = platform.statistics->BHDaysSince1970();
    conclusion.isOfNextRun = true;
    conclusion.outcome = obstacle;
    conclusion.day = hasRun && lastDay >= previousDay(today) ? today : previousDay(today);
  } else if (hasRun) {
    conclusion.day = lastDay;
    conclusion.outcome = lastLogOutcome(preferences);
  }
  return conclusion;
}

}  // namespace tavrel
