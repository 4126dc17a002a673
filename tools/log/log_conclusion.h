// What is known about the daily log without making one: what prevents the next one,
// or the outcome of the last.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "platform/linux/logs/submission_permission.h"
#include "report/log_outcome.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

struct WhitelistState {
  bool isMissing = false;
  bool isClosed = false;  // to this user
  bool isUsable = true;   // the daemon can read it
  std::string fault;      // what is wrong, where, and what to do; empty for a valid one
};

WhitelistState whitelistState(ToolContext& context);

struct LogConclusion {
  bool isOfNextRun = false;           // otherwise of the last gated run
  std::optional<std::int32_t> day;    // nothing before the first run
  std::optional<LogOutcome> outcome;  // nothing when unknown
  SubmissionPermission permission;
  WhitelistState whitelist;

  /// Whose conclusion it is.
  const char* runText() const { return isOfNextRun ? "next run" : "last daily run"; }
  /// Such as "no log for day 20781 (2026-11-24): no permission for that day".
  std::string text() const;
  /// {"run": "next", "day": 20781, "outcome": "no-whitelist"}, with null for unknown parts.
  Json json() const;
};

LogConclusion concludeOnLogs(ToolContext& context);

}  // namespace tavrel
