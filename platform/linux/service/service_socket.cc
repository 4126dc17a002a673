#include "platform/linux/service/service_socket.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "base/ascii.h"
#include "base/format.h"
#include "base/limits.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/files/system_error.h"

namespace tavrel {

namespace {

/// Connections that may wait in the kernel to be accepted; the kernel has its own upper limit.
constexpr int kBacklog = 4096;

std::string serviceFile(const DeviceRoot& root, std::string_view name, std::string_view ending) {
  std::string path(kServiceFolder);
  path.append("/").append(name).append(ending);
  return root.path(path);
}

Descriptor newSocket(int type) {
  return Descriptor(socket(AF_UNIX, type | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
}

/// Removes a stale socket at `path`. The caller must hold the service's lock.
Status removeStale(const std::string& path, const SocketAddress& address) {
  struct stat status;
  if (lstat(path.c_str(), &status) != 0) {
    if (errno == ENOENT) return Done{};
    return systemError("take the status of", path);
  }
  if (!S_ISSOCK(status.st_mode)) {
    return Error{format("cannot listen at %s: the file there is not a socket; remove it", path)};
  }
  // The service manager listens without the lock, and a connection would start the service. A
  // socket of another type never connects: when a process listens, the kernel refuses the type, and
  // when none does, it refuses the connection.
  const Descriptor probe = newSocket(SOCK_DGRAM);
  if (!probe) return systemError("open a socket for", path);
  if (connect(probe.get(), address.get(), address.size()) == 0 || errno != ECONNREFUSED) {
    return Error{format("cannot listen at %s: another process listens there", path)};
  }
  if (unlink(path.c_str()) != 0) return systemError("remove", path);
  return Done{};
}

}  // namespace

bool isServiceName(std::string_view name) {
  constexpr auto isAllowed = [](char c) {
    return isLetterOrDigit(c) || c == '.' || c == '-' || c == '_';
  };
  return !name.empty() && name.size() <= limits::kServiceNameBytes && name.front() != '.' &&
         std::all_of(name.begin(), name.end(), isAllowed);
}

std::string serviceSocketPath(const DeviceRoot& root, std::string_view name) {
  return serviceFile(root, name, ".socket");
}

Expected<SocketAddress> SocketAddress::of(const std::string& path) {
  SocketAddress result;
  result.address_.sun_family = AF_UNIX;
  std::string shortPath = path;
  if (path.size() >= sizeof result.address_.sun_path) {
    const std::size_t slash = path.rfind('/');
    const std::string folder = path.substr(0, slash);
    result.folder_ = Descriptor(open(folder.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    if (!result.folder_) return systemError("open", folder);
    shortPath = format("/proc/self/fd/%d%s", result.folder_.get(), path.substr(slash));
    if (shortPath.size() >= sizeof result.address_.sun_path) {
      return Error{format("cannot use %s as a socket: the name is too long", path)};
    }
  }
  std::memcpy(result.address_.sun_path, shortPath.data(), shortPath.size());
  return result;
}

Expected<ServiceSocket> ServiceSocket::open(const DeviceRoot& root, std::string_view name) {
  const std::string path = serviceSocketPath(root, name);
  auto lock = FileSystem().lockFileIfFree(serviceFile(root, name, ".lock"));
  if (!lock) return lock.error();
  if (!*lock) {
    return Error{format("cannot listen at %s: another process listens there", path)};
  }

  const auto address = SocketAddress::of(path);
  if (!address) return address.error();
  if (const auto removed = removeStale(path, *address); !removed) return removed.error();

  ServiceSocket result(newSocket(SOCK_SEQPACKET));
  if (!result.socket_) return systemError("open a socket for", path);
  // The file takes its mode from the socket, so at no moment can others connect.
  if (fchmod(result.get(), 0600) != 0 || bind(result.get(), address->get(), address->size()) != 0 ||
      listen(result.get(), kBacklog) != 0) {
    return systemError("listen at", path);
  }
  struct stat status;
  if (lstat(path.c_str(), &status) != 0) return systemError("take the status of", path);
  result.path_ = path;
  result.device_ = status.st_dev;
  result.inode_ = status.st_ino;
  result.lock_ = **std::move(lock);
  return result;
}

ServiceSocket::~ServiceSocket() {
  if (!socket_ || path_.empty()) return;
  struct stat status;
  if (lstat(path_.c_str(), &status) == 0 && status.st_dev == device_ && status.st_ino == inode_) {
    unlink(path_.c_str());
  }
}

}  // namespace tavrel
