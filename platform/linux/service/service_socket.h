// Where named services are found: a sequenced-packet socket below the device root,
// "/run/tavrel/NAME.socket", with "NAME.lock" beside it, which a process that made the socket
// itself holds locked. The service manager holds no lock; that it listens is found without
// connecting.
#pragma once

#include <string>
#include <string_view>
#include <sys/socket.h>
#include <sys/types.h>
#include <sys/un.h>

#include "base/expected.h"
#include "platform/linux/files/descriptor.h"
#include "platform/linux/files/device_root.h"

namespace tavrel {

inline constexpr std::string_view kServiceFolder = "/run/tavrel";

/// True for what can be the name of a service or a notification: letters, digits, ".", "-" and
/// "_", not led by ".", at most `limits::kServiceNameBytes`.
bool isServiceName(std::string_view name);

std::string serviceSocketPath(const DeviceRoot& root, std::string_view name);

/// The address of a socket file. Paths that are longer than an address holds are reached through
/// a descriptor of their folder, which lives as long as the address.
class SocketAddress {
 public:
  static Expected<SocketAddress> of(const std::string& path);

  const sockaddr* get() const { return reinterpret_cast<const sockaddr*>(&address_); }
  socklen_t size() const { return sizeof address_; }

 private:
  sockaddr_un address_{};
  Descriptor folder_;
};

/// A listening socket that this process has made. The file goes with it, unless another has taken
/// its place.
class ServiceSocket {
 public:
  /// Listens at the path of the service `name`, with mode 0600. A file that a killed process left
  /// is replaced; where somebody listens this fails.
  static Expected<ServiceSocket> open(const DeviceRoot& root, std::string_view name);
  /// Takes over a socket that another process has made and whose file it keeps.
  explicit ServiceSocket(Descriptor socket) : socket_(std::move(socket)) {}

  ServiceSocket(ServiceSocket&&) noexcept = default;
  ServiceSocket& operator=(ServiceSocket&&) = delete;
  ~ServiceSocket();

  int get() const { return socket_.get(); }

 private:
  std::string path_;
  dev_t device_ = 0;
  ino_t inode_ = 0;
  Descriptor lock_;
  Descriptor socket_;
};

}  // namespace tavrel
