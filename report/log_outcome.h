// The outcome of a day's log, and its texts, which daemon and tool share.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "platform/platform.h"

namespace tavrel {

enum class LogOutcome : std::uint8_t {
  Filed,
  FiledInPart,  // without statistics that could not be read; the system log has the error
  NotPermitted,
  PermissionUnknown,  // preferences cannot be read; the system log has the error
  NoWhitelist,
  NothingToReport,
  StoreUnreadable,  // nothing was found, but not all could be read; the system log has the error
  NotFiled,         // the system log has the error
};

/// Why there is no log, such as "no permission for that day"; empty for one filed, even in part.
std::string_view whyNoLog(LogOutcome outcome);
/// "a log for day DAY", with what it lacks, or "no log for day DAY: " and the reason.
std::string logOutcomeText(LogOutcome outcome, std::string_view day);
/// Its name in preferences and JSON, such as "not-permitted".
std::string_view nameOf(LogOutcome outcome);

/// The outcome of the last gated run, kept in the daemon's own domain; nothing when unknown.
std::optional<LogOutcome> lastLogOutcome(Preferences& preferences);
/// Sets the preference if it changes. The caller must synchronise the domain.
void rememberLogOutcome(Preferences& preferences, LogOutcome outcome);

}  // namespace tavrel
