// Datagram sockets: those of the service manager, or ones that the program opens.
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/expected.h"

namespace tavrel {

/// A descriptor of a socket, closed at the end.
class DatagramSocket {
 public:
  explicit DatagramSocket(int descriptor) : descriptor_(descriptor) {}
  DatagramSocket(DatagramSocket&& other) noexcept : descriptor_(other.descriptor_) {
    other.descriptor_ = -1;
  }
  DatagramSocket& operator=(DatagramSocket&&) = delete;
  ~DatagramSocket();

  int descriptor() const { return descriptor_; }

 private:
  int descriptor_;
};

/// The sockets that LISTEN_PID and LISTEN_FDS of the environment hand over; none when they are for
/// no one or another process. An error when one is not a datagram socket.
Expected<std::vector<DatagramSocket>> activatedDatagramSockets();

/// A socket at a port of the loopback address 127.0.0.1; 0 is any free one.
Expected<DatagramSocket> openLoopbackSocket(std::uint16_t port);

/// A Unix socket that everybody may send to. A socket at the path that nobody listens to any more
/// is replaced.
Expected<DatagramSocket> openUnixSocket(const std::string& path);

/// Bytes of a datagram. Clients fill an Ethernet packet, some a jumbo frame of 9,000 bytes at most.
inline constexpr std::size_t kLongestDatagram = 9216;

struct DatagramHandlers {
  std::function<void(std::string_view datagram)> take;
  /// A datagram was longer than `kLongestDatagram`, and is lost.
  std::function<void()> dropTooLong;
};

/// Receives until there was no datagram for `idle`; without it for ever. An error when a socket
/// fails.
Status receiveDatagrams(const std::vector<DatagramSocket>& sockets,
                        std::optional<std::chrono::milliseconds> idle,
                        const DatagramHandlers& handlers);

}  // namespace tavrel
