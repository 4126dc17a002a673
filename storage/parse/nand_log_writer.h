// The NAND log: storage statistics as a short text for the submission service, once a week.
//
//   NLW_WriteLog(platform, "165", statistics);
//
// The log is a header with the device and the time, a blank line, and one line with every statistic
// that is a number or a list of numbers: "IntermediateWamp:1.37;ValidityList[0]:12,40,7".
#pragma once

#include <string>
#include <string_view>

#include "base/plist.h"
#include "platform/platform.h"

namespace tavrel {

inline constexpr std::string_view kNandLogName = "StorageStatus";

/// Date: when the last log was written, in the program's default preference domain.
inline constexpr std::string_view kDefaultPreferenceDomain = "com.norvane.zentrix.tavrel";
inline constexpr std::string_view kNandLogLastLoggedKey = "SSLastLoggedAt";

/// The shortest time between two logs, in seconds.
inline constexpr double kNandLogPeriod = 604800;

/// Writes the log unless the last one is younger than the period or dated in the future. Writes
/// nothing for an empty `statistics` handle. The date of the log is stored whether or not the
/// submission service accepted it. A `PlatformException` of a service is logged and ends the call;
/// other exceptions pass through.
void NLW_WriteLog(Platform& platform, std::string_view logType,
                  const plist::Dictionary& statistics);

/// The device's inverse identifier; "error" when the device does not answer.
std::string GetFaultlineKey(DeviceAnswers& deviceAnswers);

}  // namespace tavrel
