#include "daemon/app_info_listener.h"

#include <cstdint>
#include <optional>

#include "daemon/app_info.h"
#include "daemon/daily_run.h"

namespace tavrel {
namespace {

void deliver(Platform& platform, const plist::Array& appData) {
  bool& requested = platform.state->appInfoRequested;
  const plist::Array appInfo = appInfoFrom(appData);
  platform.log->log(LogLevel::Default, "tavrel got %sAAI:\n%@",
                    requested ? "requested" : "(unsolicited -- so ignoring) ", appInfo);
  if (!requested) return;
  requested = false;  // even if the run throws: the list has arrived
  if (!runDailyIfNeeded(platform, appInfo)) {
    platform.log->write(LogLevel::Info,
                        "dropped the list: the daily run had already taken place, and only a list "
                        "delivered before it gets into the log");
  }
}

void announce(Platform& platform) {
  platform.state->appInfoRequested = true;
  platform.notifications->post(kLoggingNotification);
  platform.log->log(LogLevel::Default, "notified of logging status, waiting for activate app info");
}

/// The low 32 bits of an integer entry.
std::optional<std::int32_t> integerIn(const plist::Dictionary& message, std::string_view entry) {
  const auto number = message.number(entry);
  if (!number || number->isFloating()) return std::nullopt;
  return number->int32();
}

}  // namespace

void handleAppInfoMessage(Platform& platform, const plist::Value& event) {
  const plist::Dictionary message = event.dictionary();
  const auto operation = integerIn(message, "operation");
  if (!operation) return;
  if (*operation == kDeliverAppInfo) {
    if (const auto appData = message.array("app_data")) deliver(platform, appData);
    return;
  }
  const auto day = integerIn(message, "value");
  if (*operation == kForceDay && !day) return;
  if (platform.state->clientRequestHandled) {
    platform.log->log(LogLevel::Debug,
                      "ignored operation %d: this process has already acted on a request",
                      *operation);
    return;
  }
  platform.state->clientRequestHandled = true;
  switch (*operation) {
    case kAnnounceAppInfo:
      announce(platform);
      break;
    case kForceDay:
      dailyTasksForDay(platform, *day, plist::Array());
      break;
    default:
      break;
  }
}

std::unique_ptr<ServiceListener> startAppInfoListener(Platform& platform) {
  auto listener = platform.namedServices->createListener(kAppInfoServiceName);
  if (!listener) return nullptr;
  listener->setPeerHandler([&platform](PeerConnection& peer) {
    peer.setEventHandler(
        [&platform](const plist::Value& event) { handleAppInfoMessage(platform, event); });
    peer.resume();
  });
  listener->resume();
  return listener;
}

}  // namespace tavrel
