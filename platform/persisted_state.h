// Names of the persistent preferences, for all code that reads or writes them: the daemon's state,
// and the settings that others make for it. Also the log line from which a run is recorded.
#pragma once

#include <string_view>

namespace tavrel {

/// The domain of the daemon's own state. Its service has the same name.
inline constexpr std::string_view kTavrelDomain = "com.norvane.tallied.tavrel";

/// Integer: the last day whose tasks the gated run has done.
inline constexpr std::string_view kLastRunDayKey = "LastCrashLogSerializationDateInDaysSince1970";

/// String: the outcome of that run's log, a name from report/log_outcome.h.
inline constexpr std::string_view kLastLogOutcomeKey = "LastLogOutcome";

/// String: the OS version at the last log.
inline constexpr std::string_view kLastOSVersionKey = "LastOSVersion";

/// Dictionary: the OS build last seen ("version") and the day of the run that first saw it ("day").
inline constexpr std::string_view kLastOSUpdateKey = "LastOSUpdate";

/// The applied tasking: its identifier, the OS build at which it was applied, its digest and its
/// settings. A scheduled tasking uses the same names for identifier, digest and settings.
inline constexpr std::string_view kTaskingIDKey = "TaskingID";
inline constexpr std::string_view kTaskingOSKey = "TaskingOS";
inline constexpr std::string_view kTaskingDigestKey = "TaskingDigest";
inline constexpr std::string_view kTaskingPayloadKey = "TaskingPayload";

/// Members of a setting: the preference that it sets.
inline constexpr std::string_view kSettingDomain = "Domain";
inline constexpr std::string_view kSettingKey = "Key";
inline constexpr std::string_view kSettingValue = "Value";

/// Boolean: whether logs may leave the device. In the same domain are booleans named after an
/// identifier, which turn its internal diagnostics on.
inline constexpr std::string_view kDiagnosticsDomain = "com.norvane.zentrix";
inline constexpr std::string_view kSubmissionEnabledKey = "DiagnosticSubmissionEnabled";
/// Integer: the first day, since 1970 UTC, whose statistics may leave. Absent: any day's may.
inline constexpr std::string_view kSubmissionFirstDayKey = "DiagnosticSubmissionFirstDay";

/// Values that a tasking has set, among them booleans that switch whitelist groups off by name.
inline constexpr std::string_view kTaskingDomain = "com.norvane.da";

/// Integer: for how many days after an update of the OS logs are submitted at once.
inline constexpr std::string_view kAggressiveDaysKey = "AggressiveSubmissionDays";

/// Where another component schedules a tasking.
inline constexpr std::string_view kScheduleDomain = "com.norvane.Drovelink";
inline constexpr std::string_view kScheduledTaskingKey = "ScheduledTasking";

/// Settings of the storage statistics: a real number, the write amplification above which a run
/// logs the validity list; a boolean, set on a demonstration device.
inline constexpr std::string_view kNandInfoDomain = "com.norvane.NANDInfo";
inline constexpr std::string_view kUserAmplificationKey = "userWAmp";
inline constexpr std::string_view kDemoDomain = "com.norvane.demo-settings";
inline constexpr std::string_view kStoreDemoModeKey = "StoreDemoMode";

/// Begins the line that the daemon logs when it begins a day's tasks; the day follows. The record
/// of the last run takes the day from it (docs/status.md).
inline constexpr std::string_view kTasksBegin = "daily tasks for day ";

}  // namespace tavrel
