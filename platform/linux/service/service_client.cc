#include "platform/linux/service/service_client.h"

#include <cerrno>
#include <string>
#include <sys/socket.h>
#include <sys/time.h>

#include "base/format.h"
#include "base/system_text.h"
#include "platform/linux/service/service_message.h"
#include "platform/linux/service/service_socket.h"

namespace tavrel {

namespace {

constexpr timeval kSendTimeout{.tv_sec = 30, .tv_usec = 0};

std::string_view advice(int code) {
  switch (code) {
    case ENOENT:
    case ECONNREFUSED:
      return "; start tavrel or its socket unit";
    case EACCES:
    case EPERM:
      return "; only root and the service's own user may connect";
    default:
      return "";
  }
}

}  // namespace

Expected<ServiceClient> ServiceClient::connect(const DeviceRoot& root, std::string_view name) {
  if (!isServiceName(name)) return Error{format("%s is not the name of a service", name)};
  const std::string path = serviceSocketPath(root, name);
  const auto failure = [&path] {
    return Error{format("cannot connect to %s: %s%s", path, systemText(errno), advice(errno))};
  };
  const auto address = SocketAddress::of(path);
  if (!address) return address.error();
  Descriptor socket(::socket(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0));
  if (!socket) return failure();
  setsockopt(socket.get(), SOL_SOCKET, SO_SNDTIMEO, &kSendTimeout, sizeof kSendTimeout);
  if (::connect(socket.get(), address->get(), address->size()) != 0) return failure();
  return ServiceClient(std::move(socket));
}

Status ServiceClient::send(const plist::Dictionary& message) {
  return sendMessage(socket_.get(), message);
}

}  // namespace tavrel
