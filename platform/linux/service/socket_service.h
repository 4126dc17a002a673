// Named services as sequenced-packet sockets. See service_message.h for the messages,
// service_socket.h for the paths. A socket from the service manager takes precedence.
//
//   SocketServices services(loop, root, log);
//   auto listener = services.createListener("com.norvane.tallied.tavrel");
//   listener->setPeerHandler(takePeer);  // sets the peer's event handler and resumes it
//   listener->resume();
//
// Permitted peers: root and the user of this process. Others are refused, and so are packets that
// are not messages: the peer is dropped with a log line, at most `limits::kRefusalLinesPerMinute` a
// minute.
//
// The following count as events, and so restart the wait for the next one:
//   - a message, whatever it says;
//   - a new peer, and its end, whether it closed or was dropped. Of new peers in a row, with no
//     message from anybody in between, only the first `limits::kSilentConnections` count; later
//     ones are served, but the wait goes on;
//   - the end of a peer that has sent a message.
// A peer that was refused never counts.
//
// Beyond `limits::kServicePeers` peers, new ones wait in the kernel's queue until a peer leaves;
// when the system is short of descriptors or memory, they wait until the next try a second later or
// until a peer leaves. The service never writes to peers, so one that does not read costs nothing;
// the kernel blocks one that writes too fast.
#pragma once

#include <memory>
#include <string_view>

#include "platform/linux/files/device_root.h"
#include "platform/linux/process/linux_event_loop.h"
#include "platform/named_service.h"
#include "platform/system_log.h"

namespace tavrel {

/// The loop, the root and the log must outlive it; the loop and the log also its listeners.
class SocketServices final : public NamedServices {
 public:
  SocketServices(LinuxEventLoop& loop, const DeviceRoot& root, SystemLog& log)
      : loop_(loop), root_(root), log_(log) {}

  std::unique_ptr<ServiceListener> createListener(std::string_view name) override;

 private:
  LinuxEventLoop& loop_;
  const DeviceRoot& root_;
  SystemLog& log_;
};

}  // namespace tavrel
