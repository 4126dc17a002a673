// Names of the daemon's state in the preferences, for all code that reads or writes it.
#pragma once

#include <string_view>

namespace tavrel {

/// The domain of the daemon's own state. Its service has the same name.
inline constexpr std::string_view kTavrelDomain = "com.norvane.tallied.tavrel";

/// Integer: the last day that the gated run has done.
inline constexpr std::string_view kLastRunDayKey = "LastCrashLogSerializationDateInDaysSince1970";

/// String: how the log of that run came out, a name of report/log_outcome.h.
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

/// Where another component schedules a tasking.
inline constexpr std::string_view kScheduleDomain = "com.norvane.Drovelink";
inline constexpr std::string_view kScheduledTaskingKey = "ScheduledTasking";

}  // namespace tavrel
