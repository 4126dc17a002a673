// What the owner of the device has allowed: whether logs may leave it, and from which day on.
//
// Two preferences of the domain `kDiagnosticsDomain` hold it: a switch, and the first day whose
// statistics may leave. 'tavrelctl allow' sets both, so that nothing that was recorded before the
// owner agreed leaves the device. A switch that others set without a day counts at once. So a day
// left over from an earlier permission can delay a later one, but never make it count earlier than
// the switch alone would.
#pragma once

#include <cstdint>
#include <limits>
#include <optional>
#include <string>
#include <string_view>

#include "base/expected.h"

namespace tavrel {

class FilePreferences;
class Preferences;

struct SubmissionPermission {
  /// A first day that never comes: it withholds everything.
  static constexpr std::int32_t kNoDay = std::numeric_limits<std::int32_t>::max();

  bool isGiven = false;                  // the switch is on
  std::optional<std::int32_t> firstDay;  // nothing: any day
  /// The switch is off. A missing one may have been lost, and logs that wait for it stay.
  bool isWithdrawn = false;

  /// The switch is on, but the first day is not a day, so nothing may leave.
  bool isHeldBack() const { return isGiven && firstDay == kNoDay; }

  /// Whether a log of `day` may leave the device. The day is that of its statistics or, for a log
  /// without statistics, the one on which it was made.
  bool covers(std::int64_t day) const { return isGiven && (!firstDay || day >= *firstDay); }

  bool operator==(const SubmissionPermission&) const = default;
};

/// The permission as this process sees it: not given when preferences cannot be read. A first day
/// that is not a 32-bit integer counts as `kNoDay`.
SubmissionPermission submissionPermission(Preferences& preferences);

/// The permission as storage has it at this moment; an error when it cannot be read.
Expected<SubmissionPermission> storedSubmissionPermission(FilePreferences& preferences);

/// Whether a preference is one of these two, which no tasking may change.
bool isOfPermission(std::string_view domain, std::string_view key);

/// Sets both preferences; the caller synchronises the domain.
void setSubmissionPermission(Preferences& preferences, const SubmissionPermission& permission);

/// "allowed", "allowed from day 20783 (2026-11-26) on", "not allowed", or "held back: " with the
/// reason and the remedy.
std::string textOf(const SubmissionPermission& permission);

}  // namespace tavrel
