// The checks that show whether a device is well, and their results.
#pragma once

#include <chrono>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "tools/shared/tool_context.h"

namespace tavrel {

/// The values are exit statuses, following the convention of monitoring plugins.
enum class CheckState : std::uint8_t { Ok = 0, Warning = 1, Critical = 2, Unknown = 3 };

/// "OK", "WARNING", "CRITICAL", "UNKNOWN".
std::string_view nameOf(CheckState state);
/// The graver state: critical outweighs warning, and warning outweighs unknown.
CheckState graver(CheckState a, CheckState b);

/// A figure of a check, in JSON and as a metric.
struct CheckFigureKind {
  std::string_view name;    // the member in JSON
  std::string_view metric;  // the metric family
  std::string_view unit;    // at the end of the metric's name; empty without one
  std::string_view help;
};

struct CheckFigure {
  const CheckFigureKind* kind;
  double value;
};

struct Check {
  std::string_view name;     // "queue"
  std::string subject = {};  // "pending"; empty when there is only one
  CheckState state = CheckState::Ok;
  std::string text = {};  // one line
  std::vector<CheckFigure> figures = {};
};

/// The ages, in seconds, at which the lack of something that should happen each day becomes a
/// warning, and then critical. Every check of an age uses these two thresholds.
inline constexpr std::int64_t kWarningAge = std::int64_t{2} * 86'400;
inline constexpr std::int64_t kCriticalAge = std::int64_t{7} * 86'400;

CheckState stateOfAge(std::int64_t seconds);

/// Runs all checks, in the order in which they are shown. Changes nothing. `examination` limits how
/// long the store's file is searched for damage.
std::vector<Check> checkDevice(ToolContext& context, std::chrono::milliseconds examination);

/// Prints a line for each check and sets the exit status to the gravest state.
void showChecks(ToolContext& context);

}  // namespace tavrel
