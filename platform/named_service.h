// Listening on a named service. Events are delivered while the event loop runs a slice, one at a
// time.
#pragma once

#include <functional>
#include <memory>
#include <string_view>

#include "base/plist.h"

namespace tavrel {

/// A peer that has connected. It lives until it disconnects.
class PeerConnection {
 public:
  using EventHandler = std::function<void(const plist::Value&)>;

  virtual ~PeerConnection() = default;
  /// Called for each event: a dictionary is a message, null an error or the end of the peer.
  virtual void setEventHandler(EventHandler handler) = 0;
  /// Starts delivering events.
  virtual void resume() = 0;
};

/// Closes the service when released.
class ServiceListener {
 public:
  using PeerHandler = std::function<void(PeerConnection&)>;

  virtual ~ServiceListener() = default;
  /// Called for each new peer.
  virtual void setPeerHandler(PeerHandler handler) = 0;
  virtual void resume() = 0;
};

class NamedServices {
 public:
  virtual ~NamedServices() = default;
  /// Null when the listener cannot be made; the system log has the reason.
  virtual std::unique_ptr<ServiceListener> createListener(std::string_view name) = 0;
};

}  // namespace tavrel
