// What is looked at to tell whether a device is well, and how it was found.
#pragma once

#include <chrono>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "tools/shared/tool_context.h"

namespace tavrel {

/// The values are exit statuses, as monitoring plugins have them.
enum class CheckState : std::uint8_t { Ok = 0, Warning = 1, Critical = 2, Unknown = 3 };

/// "OK", "WARNING", "CRITICAL", "UNKNOWN".
std::string_view nameOf(CheckState state);
/// The graver one: what is critical weighs most, then warnings, then what is unknown.
CheckState graver(CheckState a, CheckState b);

/// A figure that a check looks at, in JSON and as a metric.
struct CheckFigureKind {
  std::string_view name;    // of the member in JSON
  std::string_view metric;  // of the metric family
  std::string_view unit;    // at the metric's end; empty when it has none
  std::string_view help;
};

struct CheckFigure {
  const CheckFigureKind* kind;
  double value;
};

struct Check {
  std::string_view name;     // "queue"
  std::string subject = {};  // "pending"; empty where there is only one
  CheckState state = CheckState::Ok;
  std::string text = {};  // on one line
  std::vector<CheckFigure> figures = {};
};

/// Ages beyond which something that should happen each day has not happened, in seconds. Every
/// check of an age has these two thresholds.
inline constexpr std::int64_t kWarningAge = std::int64_t{2} * 86'400;
inline constexpr std::int64_t kCriticalAge = std::int64_t{7} * 86'400;

CheckState stateOfAge(std::int64_t seconds);

/// Looks at everything, in the order in which it is shown. Changes nothing. `examination`: how long
/// the store's file may be looked through for damage.
std::vector<Check> checkDevice(ToolContext& context, std::chrono::milliseconds examination);

/// Prints a line for each check and sets the exit status to the gravest state.
void showChecks(ToolContext& context);

}  // namespace tavrel
