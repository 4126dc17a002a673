// A listening service socket and its peers. See socket_service.h for the rules.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <sys/socket.h>
#include <unordered_map>

#include "platform/linux/linux_event_loop.h"
#include "platform/linux/service_socket.h"
#include "platform/named_service.h"
#include "platform/system_log.h"

namespace tavrel {

/// Writes lines about refusals until there were enough of them for a minute, and then says how many
/// were left out.
class RefusalLog {
 public:
  explicit RefusalLog(SystemLog& log) : log_(log) {}
  RefusalLog(const RefusalLog&) = delete;
  RefusalLog& operator=(const RefusalLog&) = delete;
  ~RefusalLog();
  void write(std::string_view line);

 private:
  void sayLeftOut();

  SystemLog& log_;
  std::chrono::steady_clock::time_point minuteBegan_{};
  int written_ = 0;
  int leftOut_ = 0;
};

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
  /// True for a user who may use the service; says so in the log when not.
  bool admits(const ucred& user);
  void pause(std::string_view why);
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
};

}  // namespace tavrel
