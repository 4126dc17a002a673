#include "platform/linux/service/socket_service.h"

#include <algorithm>
#include <string>
#include <sys/resource.h>

#include "base/limits.h"
#include "platform/linux/service/service_socket.h"
#include "platform/linux/service/socket_activation.h"
#include "platform/linux/service/socket_listener.h"

namespace tavrel {

namespace {

/// Raises the soft limit, to have a descriptor per peer, up to the hard limit. The usual soft limit
/// of 1,024 exists for programs that use select.
void raiseDescriptorLimit() {
  constexpr rlim_t kWanted = limits::kServicePeers + 128;
  rlimit limit;
  if (getrlimit(RLIMIT_NOFILE, &limit) != 0 || limit.rlim_cur >= kWanted) return;
  limit.rlim_cur = std::min(kWanted, limit.rlim_max);
  setrlimit(RLIMIT_NOFILE, &limit);
}

}  // namespace

std::unique_ptr<ServiceListener> SocketServices::createListener(std::string_view name) {
  if (!isServiceName(name)) {
    log_.log(LogLevel::Debug, "cannot listen as %s: the name is not a file name", name);
    return nullptr;
  }
  raiseDescriptorLimit();
  if (Descriptor activated = activatedSocket(name, log_)) {
    return std::make_unique<SocketListener>(std::string(name), ServiceSocket(std::move(activated)),
                                            loop_, log_);
  }
  auto socket = ServiceSocket::open(root_, name);
  if (!socket) {
    log_.log(LogLevel::Default, "%s: %s", name, socket.error().message);
    return nullptr;
  }
  return std::make_unique<SocketListener>(std::string(name), *std::move(socket), loop_, log_);
}

}  // namespace tavrel
