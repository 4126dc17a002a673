#include "tools/log/log_conclusion.h"

#include <cerrno>
#include <nlohmann/json.hpp>
#include <unistd.h>

#include "base/arithmetic.h"
#include "base/format.h"
#include "base/limits.h"
#include "config/bh_config.h"
#include "platform/linux/files/device_root.h"
#include "platform/persisted_state.h"
#include "platform/platform.h"
#include "tools/console/day_argument.h"
#include "tools/shared/input_file.h"

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
  return {{"run", isOfNextRun ? "next" : "last"},
          {"day", day ? Json(*day) : Json(nullptr)},
          {"date", day ? Json(dayDateText(*day)) : Json(nullptr)},
          {"outcome", outcome ? Json(nameOf(*outcome)) : Json(nullptr)}};
}

WhitelistState whitelistState(ToolContext& context) {
  Platform& platform = context.platform();
  const std::string path = context.root().path(kWhitelistPath);
  WhitelistState state;
  // Read it the way the daemon does.
  const auto bytes = platform.files->read(kWhitelistPath, limits::kWhitelistBytes);
  if (!bytes) {
    const int obstacle = access(path.c_str(), R_OK) == 0 ? 0 : errno;
    state.isMissing = obstacle == ENOENT;
    state.isClosed = obstacle == EACCES;
    state.isUsable = false;
    state.fault = bytes.error().message;
    if (state.isMissing) state.fault += kWriteWhitelist;
    return state;
  }
  const auto value = platform.propertyLists->decode(asBytes(*bytes));
  state.isUsable = static_cast<bool>(value);
  if (!value || !value->dictionary()) {
    state.fault = format("%s: %s: repair it, or replace it with another whitelist", path,
                         value ? "not a dictionary of groups" : value.error().message);
  }
  return state;
}

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
  conclusion.whitelist = whitelistState(context);
  if (!conclusion.permission.covers(next)) {
    conclusion.outcome = platform.submission->isPermissionReadable()
                             ? LogOutcome::NotPermitted
                             : LogOutcome::PermissionUnknown;
  } else if (!conclusion.whitelist.isUsable) {
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
