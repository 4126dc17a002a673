// The service that clients call to trigger the daily run and to hand over the list of activated
// applications.
//
// A message is a dictionary with a number "operation": 0 announces app information, 1 forces the
// tasks of the day "value", 2 delivers the information in "app_data". A message that lacks what its
// operation needs is ignored. Nothing is ever answered.
#pragma once

#include <memory>
#include <string_view>

#include "platform/persisted_state.h"
#include "platform/platform.h"

namespace tavrel {

inline constexpr std::string_view kAppInfoServiceName = kTavrelDomain;
inline constexpr std::string_view kLoggingNotification = "com.norvane.tallied.tavrel.logging";

/// Starts to listen; events are handled while the event loop runs. The service ends when the
/// listener is released. Null when the service cannot be had. The platform must outlive it.
std::unique_ptr<ServiceListener> startAppInfoListener(Platform& platform);

/// Handles one event of a peer; what is no message is ignored.
void handleAppInfoMessage(Platform& platform, const plist::Value& event);

}  // namespace tavrel
