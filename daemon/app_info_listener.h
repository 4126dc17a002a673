// The service through which clients trigger the daily run and deliver the list of activated
// applications.
//
// A message is a dictionary with a number "operation": 0 announces app information, 1 forces the
// tasks of the day "value", 2 delivers the information in "app_data". A message that lacks what its
// operation needs is ignored. The service answers no message.
#pragma once

#include <memory>
#include <string_view>

#include "config/persisted_state.h"
#include "platform/platform.h"

namespace tavrel {

inline constexpr std::string_view kAppInfoServiceName = kTavrelDomain;
inline constexpr std::string_view kLoggingNotification = "com.norvane.tallied.tavrel.logging";

/// Starts listening; the event loop handles events while it runs. Releasing the listener ends the
/// service. Null when the service cannot be made. The platform must outlive it.
std::unique_ptr<ServiceListener> startAppInfoListener(Platform& platform);

/// Handles one event of a peer; ignores anything but a message.
void handleAppInfoMessage(Platform& platform, const plist::Value& event);

}  // namespace tavrel
