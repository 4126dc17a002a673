// The sockets of named services: a sequenced-packet socket below the device root,
// "/run/tavrel/NAME.socket". A process that makes the socket itself locks "NAME.lock" in the same
// folder. The service manager holds no lock; whether it listens is checked without connecting.
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

/// True for a possible name of a service or a notification: letters, digits, ".", "-" and "_", not
/// beginning with ".", at most `limits::kServiceNameBytes`.
bool isServiceName(std::string_view name);

std::string serviceSocketPath(const DeviceRoot& root, std::string_view name);

/// The address of a socket file. A path too long for an address is reached through a descriptor of
/// its folder, which lives as long as the address.
class SocketAddress {
 public:
  static Expected<SocketAddress> of(const std::string& path);

  const sockaddr* get() const { return reinterpret_cast<const sockaddr*>(&address_); }
  socklen_t size() const { return sizeof address_; }

 private:
  sockaddr_un address_{};
  Descriptor folder_;
};

/// A listening socket. If this process made it, its file is removed with it, unless another file
/// has taken its place.
class ServiceSocket {
 public:
  /// Listens at the path of the service `name`, with mode 0600. Replaces a file that a killed
  /// process left; fails when a process listens there.
  static Expected<ServiceSocket> open(const DeviceRoot& root, std::string_view name);
  /// Takes over a socket that another process has made; that process keeps the file.
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
