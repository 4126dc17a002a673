#include "statsd/statsd_sockets.h"

#include <array>
#include <cerrno>
#include <csignal>
#include <fcntl.h>
#include <memory>
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include "base/activated_descriptors.h"
#include "base/format.h"
#include "base/system_text.h"

namespace tavrel {
namespace {

constexpr int kMostSockets = 16;

// datagrams per system call
constexpr unsigned kBatch = 32;

// Bytes that the kernel buffers while the program is busy or starting; the kernel may grant less.
constexpr int kReceiveBuffer = 1 << 20;

bool isDatagramSocket(int descriptor) {
  int type = 0;
  socklen_t size = sizeof type;
  return getsockopt(descriptor, SOL_SOCKET, SO_TYPE, &type, &size) == 0 && type == SOCK_DGRAM;
}

// 0, or an `errno`.
template <class Address>
int bindTo(const DatagramSocket& made, const Address& address) {
  const auto* const any = reinterpret_cast<const sockaddr*>(&address);
  return bind(made.descriptor(), any, sizeof address) == 0 ? 0 : errno;
}

std::string_view adviceFor(int code) {
  switch (code) {
    case EADDRINUSE:
      return "; stop or remove what uses it, or give another";
    case EMFILE:
      return "; raise the number of files that a process may open (ulimit -n)";
    default:
      return "";
  }
}

Error failure(std::string_view what, int code = errno) {
  return Error{format("%s: %s%s", what, systemText(code), adviceFor(code))};
}

Expected<DatagramSocket> newSocket(int family) {
  DatagramSocket made(socket(family, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  if (made.descriptor() < 0) return failure("cannot create a socket");
  setsockopt(made.descriptor(), SOL_SOCKET, SO_RCVBUF, &kReceiveBuffer, sizeof kReceiveBuffer);
  return made;
}

// Whether the path is a socket that refuses connections because its program has ended.
bool isAbandoned(const sockaddr_un& address) {
  struct stat status {};
  if (lstat(address.sun_path, &status) != 0 || !S_ISSOCK(status.st_mode)) return false;
  const auto probe = newSocket(AF_UNIX);
  const auto* const any = reinterpret_cast<const sockaddr*>(&address);
  return probe && connect(probe->descriptor(), any, sizeof address) != 0 && errno == ECONNREFUSED;
}

// A datagram on a Unix socket may bring descriptors, which the kernel closes when it is received.
// Closing a TCP socket waits as long as its sender likes (SO_LINGER). Linux 6.16 and later can
// refuse descriptors; a signal ends the wait on any kernel, and the datagram is received all the
// same.
bool mayWaitForClosing(int descriptor) {
#ifdef SO_PASSRIGHTS
  constexpr int kPassRights = SO_PASSRIGHTS;
#else
  constexpr int kPassRights = 83;
#endif
  int domain = 0;
  socklen_t size = sizeof domain;
  getsockopt(descriptor, SOL_SOCKET, SO_DOMAIN, &domain, &size);
  if (domain != AF_UNIX) return false;
  constexpr int kNo = 0;
  setsockopt(descriptor, SOL_SOCKET, kPassRights, &kNo, sizeof kNo);
  return true;
}

// Interrupts a system call that lasts longer than a second.
class Alarm {
 public:
  explicit Alarm(bool isNeeded) : isSet_(isNeeded) {
    if (isSet_) alarm(1);
  }
  ~Alarm() {
    if (isSet_) alarm(0);
  }
  Alarm(const Alarm&) = delete;
  Alarm& operator=(const Alarm&) = delete;

  static void prepare() {
    struct sigaction action {};
    action.sa_handler = [](int) {};  // SIG_IGN would interrupt nothing
    sigaction(SIGALRM, &action, nullptr);
  }

 private:
  const bool isSet_;
};

// The buffers that the kernel fills with a batch.
class Batch {
 public:
  Batch() : bytes_(new char[kBatch][kLongestDatagram]) {
    for (unsigned i = 0; i < kBatch; ++i) {
      parts_[i] = {.iov_base = bytes_[i], .iov_len = kLongestDatagram};
      messages_[i] = {};
      messages_[i].msg_hdr.msg_iov = &parts_[i];
      messages_[i].msg_hdr.msg_iovlen = 1;
    }
  }

  // The number of datagrams received: 0 when none is waiting, -1 with errno set on failure.
  int receive(int descriptor) {
    int count = 0;
    do {
      count = recvmmsg(descriptor, messages_.data(), kBatch, MSG_DONTWAIT, nullptr);
    } while (count < 0 && errno == EINTR);
    return count < 0 && errno == EAGAIN ? 0 : count;
  }

  void hand(int count, const DatagramHandlers& handlers) const {
    for (unsigned i = 0; i < static_cast<unsigned>(count); ++i) {
      if ((messages_[i].msg_hdr.msg_flags & MSG_TRUNC) != 0) {
        handlers.dropTooLong();
      } else {
        handlers.take({bytes_[i], messages_[i].msg_len});
      }
    }
  }

 private:
  std::unique_ptr<char[][kLongestDatagram]> bytes_;
  std::array<iovec, kBatch> parts_;
  std::array<mmsghdr, kBatch> messages_;
};

}  // namespace

DatagramSocket::~DatagramSocket() {
  if (descriptor_ >= 0) close(descriptor_);
}

Expected<std::vector<DatagramSocket>> activatedDatagramSockets() {
  std::vector<DatagramSocket> sockets;
  const int count = activatedDescriptors(getpid());
  if (count > kMostSockets) {
    return Error{format("LISTEN_FDS passes %d sockets: pass at most %d", count, kMostSockets)};
  }
  for (int i = 0; i < count; ++i) {
    const int descriptor = kFirstActivatedDescriptor + i;
    if (!isDatagramSocket(descriptor)) {
      return Error{
          format("descriptor %d of LISTEN_FDS is not a datagram socket: use "
                 "ListenDatagram= in the socket unit",
                 descriptor)};
    }
    fcntl(descriptor, F_SETFD, FD_CLOEXEC);
    sockets.emplace_back(descriptor);
  }
  return sockets;
}

Expected<DatagramSocket> openLoopbackSocket(std::uint16_t port) {
  auto made = newSocket(AF_INET);
  if (!made) return made;
  sockaddr_in address{};
  address.sin_family = AF_INET;
  address.sin_port = htons(port);
  address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
  if (const int code = bindTo(*made, address); code != 0) {
    return failure(format("cannot listen on UDP port %u", unsigned{port}), code);
  }
  return made;
}

Expected<DatagramSocket> openUnixSocket(const std::string& path) {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  if (path.empty() || path.size() >= sizeof address.sun_path) {
    return Error{format("cannot listen on %s: give a path of at most %zu bytes", path,
                        sizeof address.sun_path - 1)};
  }
  path.copy(address.sun_path, path.size());
  auto made = newSocket(AF_UNIX);
  if (!made) return made;
  int code = bindTo(*made, address);
  if (code == EADDRINUSE && isAbandoned(address)) {
    unlink(address.sun_path);
    code = bindTo(*made, address);
  }
  if (code != 0) return failure(format("cannot listen on %s", path), code);
  chmod(address.sun_path, 0666);
  return made;
}

Status receiveDatagrams(const std::vector<DatagramSocket>& sockets,
                        std::optional<std::chrono::milliseconds> idle,
                        const DatagramHandlers& handlers) {
  std::vector<pollfd> waiting;
  std::vector<bool> needAlarms;
  for (const DatagramSocket& socket : sockets) {
    waiting.push_back({.fd = socket.descriptor(), .events = POLLIN, .revents = 0});
    needAlarms.push_back(mayWaitForClosing(socket.descriptor()));
  }
  Alarm::prepare();
  Batch batch;
  const int patience = idle ? static_cast<int>(idle->count()) : -1;
  for (;;) {
    const int ready = poll(waiting.data(), waiting.size(), patience);
    if (ready == 0) return Done{};
    if (ready < 0 && errno != EINTR) return failure("cannot wait for datagrams");
    if (ready < 0) continue;
    for (std::size_t i = 0; i < waiting.size(); ++i) {
      if (waiting[i].revents == 0) continue;
      int count = 0;
      {
        const Alarm alarm(needAlarms[i]);
        count = batch.receive(waiting[i].fd);
      }
      if (count < 0) return failure("cannot receive datagrams");
      batch.hand(count, handlers);
    }
    if (Status goesOn = handlers.pause(); !goesOn) return goesOn;
  }
}

}  // namespace tavrel
