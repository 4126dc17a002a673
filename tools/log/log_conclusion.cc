#include "tools/log/log_conclusion.h"

#include <nlohmann/json.hpp>

#include "base/arithmetic.h"
#include "base/format.h"
#include "base/limits.h"
#include "config/bh_config.h"
#include "platform/persisted_state.h"
#include "platform/platform.h"
#include "tools/shared/day_argument.h"

namespace tavrel {

std::string LogConclusion::text() const {
  if (!day) return "none yet";
  if (!outcome) return format("day %s, outcome unknown", dayText(*day));
  if (isOfNextRun && permission.isGiven && outcome == LogOutcome::NotPermitted) {
    return format("no log for day %s: submission is %s", dayText(*day), textOf(permission));
  }
  return logOutcomeText(*outcome, dayText(*day));
}

Json LogConclusion::json() const {
  return {{"run", run()},
          {"day", day ? Json(*day) : Json(nullptr)},
          {"date", day ? Json(dayDateText(*day)) : Json(nullptr)},
          {"outcome", outcome ? Json(nameOf(*outcome)) : Json(nullptr)}};
}

namespace {

// As the daemon reads it; it logs what is wrong with it.
bool hasUsableWhitelist(Platform& platform) {
  const auto bytes = platform.files->read(kWhitelistPath, limits::kWhitelistBytes);
  return bytes && platform.propertyLists->decode(asBytes(*bytes));
}

}  // namespace

LogConclusion concludeOnLogs(ToolContext& context) {
  Platform& platform = context.platform();
  Preferences& preferences = platform.preferences;
  bool hasRun = false;
  const std::int32_t lastDay =
      lowInt32(preferences.ZTXPreferencesGetIntegerValue(kLastRunDayKey, kTavrelDomain, &hasRun));
  const std::int32_t today = platform.statistics->BHDaysSince1970();
  const std::int32_t next = hasRun && lastDay >= previousDay(today) ? today : previousDay(today);
  LogConclusion conclusion;
  conclusion.permission = submissionPermission(preferences);
  if (!conclusion.permission.covers(next)) {
    conclusion.outcome = LogOutcome::NotPermitted;
  } else if (!hasUsableWhitelist(platform)) {
    conclusion.outcome = LogOutcome::NoWhitelist;
  }
  conclusion.isOfNextRun = conclusion.outcome.has_value();
  if (conclusion.isOfNextRun) {
    conclusion.day = next;
  } else if (hasRun) {
    conclusion.day = lastDay;
    conclusion.outcome = lastLogOutcome(preferences);
  }
  return conclusion;
}

}  // namespace tavrel
