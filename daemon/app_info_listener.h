// The service through which clients trigger the daily run and deliver the list of activated
// applications.
//
// A message is a dictionary with a number "operation". A message that lacks an entry that its
// operation needs is ignored. There are no replies.
#pragma once

#include <cstdint>
#include <memory>
#include <string_view>

#include "platform/persisted_state.h"
#include "platform/platform.h"

namespace tavrel {

inline constexpr std::string_view kAppInfoServiceName = kTavrelDomain;
inline constexpr std::string_view kLoggingNotification = "com.norvane.tallied.tavrel.logging";

/// The operations of a message.
inline constexpr std::int32_t kAnnounceAppInfo = 0;
inline constexpr std::int32_t kForceDay = 1;        // the tasks of the day "value"
inline constexpr std::int32_t kDeliverAppInfo = 2;  // the applications in "app_data"

/// Starts to listen; events are handled while the event loop runs. The service ends when the
/// listener is released. Null when the service cannot be created. The platform must outlive it.
std::unique_ptr<ServiceListener> startAppInfoListener(Platform& platform);

/// Handles one event of a peer; ignores anything but a message. The process serves one request: the
/// first message with an operation other than 2, known or not, uses it up, and later ones are
/// ignored with a debug line.
void handleAppInfoMessage(Platform& platform, const plist::Value& event);

}  // namespace tavrel
