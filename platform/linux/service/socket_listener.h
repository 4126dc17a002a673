// A listening service socket and its peers. See socket_service.h for the rules.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <sys/socket.h>
#include <unordered_map>

#include "platform/linux/process/linux_event_loop.h"
#include "platform/linux/service/service_socket.h"
#include "platform/linux/system_log/refusal_log.h"
#include "platform/named_service.h"
#include "platform/system_log.h"

namespace tavrel {

class SocketListener final : public ServiceListener {
 public:
  SocketListener(std::string name, ServiceSocket socket, LinuxEventLoop& loop, SystemLog& log);
  ~SocketListener() override;

  void setPeerHandler(PeerHandler handler) override { peerHandler_ = std::move(handler); }
  void resume() override;

 private:
  using Activity = LinuxEventLoop::Activity;
  class Peer;

  Activity acceptPeer();
  /// True for a user who may use the service; otherwise logs the refusal.
  bool admits(const ucred& user);
  void acceptFailed(int code);
  void pause();
  void endPause();
  Activity tryAgain();
  void release(std::uint64_t peerId);

  std::string name_;
  LinuxEventLoop& loop_;
  SystemLog& log_;
  RefusalLog refusals_;
  PeerHandler peerHandler_;
  ServiceSocket socket_;
  LinuxEventLoop::Source source_;
  std::unique_ptr<std::byte[]> buffer_;  // one packet, of whichever peer is being read
  std::unordered_map<std::uint64_t, std::unique_ptr<Peer>> peers_;
  std::uint64_t lastPeerId_ = 0;
  int silentInARow_ = 0;
  bool paused_ = false;
  bool isShort_ = false;   // descriptors or memory were short at the last attempt
  Descriptor retryTimer_;  // made in advance, since descriptors may be short when it is needed
  LinuxEventLoop::Source retry_;
};

}  // namespace tavrel
