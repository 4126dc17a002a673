// Names of the daemon's state in the preferences, for everybody who reads or writes it.
#pragma once

#include <string_view>

namespace tavrel {

/// The domain of the daemon's own state. Its service has the same name.
inline constexpr std::string_view kTavrelDomain = "com.norvane.tallied.tavrel";

/// Integer: the last day for which the gated run was done.
inline constexpr std::string_view kLastRunDayKey = "LastCrashLogSerializationDateInDaysSince1970";

/// String: how the log of that run came out, a name of report/log_outcome.h.
inline constexpr std::string_view kLastLogOutcomeKey = "LastLogOutcome";

/// String: the OS version at the last log.
inline constexpr std::string_view kLastOSVersionKey = "LastOSVersion";

/// Dictionary: the OS build last seen ("version") and the day of the run that first saw it ("day").
inline constexpr std::string_view kLastOSUpdateKey = "LastOSUpdate";

/// The tasking that is applied: its identifier, the OS build at which it was applied, its digest
/// and its settings. The identifier, digest and settings have the same names where a tasking is
/// scheduled.
inline constexpr std::string_view kTaskingIDKey = "TaskingID";
inline constexpr std::string_view kTaskingOSKey = "TaskingOS";
inline constexpr std::string_view kTaskingDigestKey = "TaskingDigest";
inline constexpr std::string_view kTaskingPayloadKey = "TaskingPayload";

/// Where another component schedules a tasking.
inline constexpr std::string_view kScheduleDomain = "com.norvane.Drovelink";
inline constexpr std::string_view kScheduledTaskingKey = "ScheduledTasking";

}  // namespace tavrel
