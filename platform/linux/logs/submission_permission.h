// What the owner of the device has allowed: whether logs may leave it, and from which day on.
//
// Two preferences of the domain `kDiagnosticsDomain` hold it: a switch, and the first day whose
// statistics may leave. 'tavrelctl allow' sets both, so that nothing that was recorded before the
// owner agreed leaves the device. A switch that others set without a day counts at once. So a day
// that is left over from an earlier permission can hold a later one back, but never let it count
// earlier than a switch alone would.
#pragma once

#include <cstdint>
#include <limits>
#include <optional>
#include <string>

#include "base/expected.h"
#include "base/plist.h"

namespace tavrel {

class FilePreferences;
class Preferences;

struct SubmissionPermission {
  /// A first day that is none: it holds everything back.
  static constexpr std::int32_t kNoDay = std::numeric_limits<std::int32_t>::max();

  bool isGiven = false;                  // the switch
  std::optional<std::int32_t> firstDay;  // nothing: any day

  /// Whether a log of `day` may leave the device: the day of its statistics, or the one on which a
  /// log without statistics was made.
  bool covers(std::int64_t day) const { return isGiven && (!firstDay || day >= *firstDay); }

  bool operator==(const SubmissionPermission&) const = default;
};

/// As this process sees it: not given when preferences cannot be read. A first day that is no
/// integer of 32 bits counts as `kNoDay`.
SubmissionPermission submissionPermission(Preferences& preferences);

/// As storage has it at this moment; an error when it cannot be read.
Expected<SubmissionPermission> storedSubmissionPermission(FilePreferences& preferences);

/// Sets both preferences; the caller synchronises the domain.
void setSubmissionPermission(Preferences& preferences, const SubmissionPermission& permission);

/// "allowed", "allowed from day 20783 (2026-11-26) on" or "not allowed".
std::string textOf(const SubmissionPermission& permission);

}  // namespace tavrel
