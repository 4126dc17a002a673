// A tasking as operators write it: a property list or JSON (tools/console/json_value.h) of the form
//
//   {"TaskingID": "fleet-7",
//    "TaskingDigest": "5d41402a",
//    "TaskingPayload": [
//      {"Domain": "com.norvane.da", "Key": "AggressiveSubmissionDays", "Value": 3}]}
//
// TaskingDigest may be any value, and may be absent. Without TaskingPayload, the device reverts
// what it applied before and applies nothing new.
#pragma once

#include <string>
#include <vector>

#include "base/plist.h"

namespace tavrel {

/// The reasons why a device would not apply the tasking as written, or would not read a setting,
/// one line each, such as "TaskingPayload[3]/Domain: is missing". Empty for a valid tasking.
std::vector<std::string> checkTasking(const plist::Value& tasking);

}  // namespace tavrel
