// Named services as sequenced-packet sockets. The messages are those of service_message.h, the
// places those of service_socket.h; a socket that the service manager hands over comes first.
//
//   SocketServices services(loop, root, log);
//   auto listener = services.createListener("com.norvane.tallied.tavrel");
//   listener->setPeerHandler(takePeer);  // sets the peer's event handler and resumes it
//   listener->resume();
//
// Who may talk: root and the user that this process runs as. Others are refused, and so are packets
// that are no message: the peer is dropped with a log line, of which there are at most
// `limits::kRefusalLinesPerMinute` a minute.
//
// What counts as an event, and so makes the wait for the next one begin anew:
//   - a message, whatever it says;
//   - a new peer, and its end, by itself or because it was dropped. Of new peers in a row, with no
//     message from anybody in between, only the first `limits::kSilentConnections` count; further
//     ones are served, but the wait goes on;
//   - the end of a peer that has sent a message.
// A peer that was refused never counts.
//
// Beyond `limits::kServicePeers` peers new ones wait in the kernel's queue until a peer leaves;
// when the system is short of descriptors or memory, also until the next try a second later. Nobody
// is written to, so a peer that does not read costs nothing; one that writes too fast is held up by
// the kernel.
#pragma once

#include <memory>
#include <string_view>

#include "platform/linux/files/device_root.h"
#include "platform/linux/process/linux_event_loop.h"
#include "platform/named_service.h"
#include "platform/system_log.h"

namespace tavrel {

/// The loop, the root and the log must outlive it, the loop and the log its listeners too.
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
