// Datagram sockets: from the service manager, or opened by the program.
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

/// Owns the descriptor of a socket.
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

/// The sockets that the environment passes in LISTEN_PID and LISTEN_FDS; none when the variables
/// are missing or meant for another process. An error when one is not a datagram socket.
Expected<std::vector<DatagramSocket>> activatedDatagramSockets();

/// Opens a port of the loopback address 127.0.0.1; 0 stands for any free port.
Expected<DatagramSocket> openLoopbackSocket(std::uint16_t port);

/// Opens a Unix socket that everybody may send to. Replaces a socket at the path if
/// nobody listens on it any more.
Expected<DatagramSocket> openUnixSocket(const std::string& path);

/// Bytes of a datagram. Clients fill an Ethernet packet or, at most, a jumbo frame of 9,000 bytes.
inline constexpr std::size_t kLongestDatagram = 9216;

struct DatagramHandlers {
  std::function<void(std::string_view datagram)> take;
  /// Called when a datagram was longer than `kLongestDatagram` and is lost.
  std::function<void()> dropTooLong;
  /// Called after some datagrams; an error ends the reception.
  std::function<Status()> pause;
};

/// Receives until no datagram has arrived for `idle`, or for ever without it. An
/// error when a socket fails, or that of `pause`.
Status receiveDatagrams(const std::vector<DatagramSocket>& sockets,
                        std::optional<std::chrono::milliseconds> idle,
                        const DatagramHandlers& handlers);

}  // namespace tavrel
