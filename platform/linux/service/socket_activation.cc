#include "platform/linux/service/socket_activation.h"

#include <cerrno>
#include <cstdlib>
#include <fcntl.h>
#include <string>
#include <sys/socket.h>
#include <unistd.h>
#include <vector>

#include "base/activated_descriptors.h"
#include "base/limits.h"
#include "base/system_text.h"

namespace tavrel {

namespace {

std::vector<std::string> namesFromEnvironment() {
  std::vector<std::string> names;
  const char* text = std::getenv("LISTEN_FDNAMES");
  if (!text) return names;
  std::string_view rest = text;
  while (true) {
    const std::size_t colon = rest.find(':');
    names.emplace_back(rest.substr(0, colon));
    if (colon == std::string_view::npos) return names;
    rest.remove_prefix(colon + 1);
  }
}

bool hasSocketOption(int descriptor, int option, int wanted) {
  int value = 0;
  socklen_t size = sizeof value;
  return getsockopt(descriptor, SOL_SOCKET, option, &value, &size) == 0 && value == wanted;
}

bool isListeningPacketSocket(int descriptor) {
  return hasSocketOption(descriptor, SO_DOMAIN, AF_UNIX) &&
         hasSocketOption(descriptor, SO_TYPE, SOCK_SEQPACKET) &&
         hasSocketOption(descriptor, SO_ACCEPTCONN, 1);
}

}  // namespace

Descriptor activatedSocket(std::string_view name, SystemLog& log) {
  const int count = activatedDescriptors(getpid());
  if (count == 0) return {};
  if (count > limits::kActivationDescriptors) {
    log.log(LogLevel::Error, "LISTEN_FDS passes %d sockets; the limit is %d: none is used", count,
            limits::kActivationDescriptors);
    return {};
  }

  const std::vector<std::string> names = namesFromEnvironment();
  int chosen = -1;
  int fitting = 0;
  bool byName = false;
  bool isUnfit = false;  // the one that is meant
  for (int i = 0; i < count; ++i) {
    const int descriptor = kFirstActivatedDescriptor + i;
    fcntl(descriptor, F_SETFD, FD_CLOEXEC);
    const auto index = static_cast<std::size_t>(i);
    const bool isNamed = index < names.size() && names[index] == name;
    if (!isListeningPacketSocket(descriptor)) {
      if (isNamed || count == 1) {
        log.log(LogLevel::Error,
                "descriptor %d of LISTEN_FDS is not a listening sequenced-packet socket: use "
                "ListenSequentialPacket= and Accept=no in the socket unit",
                descriptor);
        isUnfit = true;
      }
      continue;
    }
    ++fitting;
    if (isNamed || !byName) chosen = descriptor;
    byName |= isNamed;
  }
  if (chosen < 0 && isUnfit) return {};
  if (chosen < 0 || (!byName && fitting > 1)) {
    log.log(LogLevel::Error,
            "none of the %d sockets of LISTEN_FDS is known to be %s: set FileDescriptorName=%s "
            "in the socket unit",
            count, name, name);
    return {};
  }
  // A duplicate, so that closing the listener does not free the number for other files.
  Descriptor socket(fcntl(chosen, F_DUPFD_CLOEXEC, kFirstActivatedDescriptor));
  const int flags = socket ? fcntl(socket.get(), F_GETFL) : -1;
  if (flags < 0 || fcntl(socket.get(), F_SETFL, flags | O_NONBLOCK) != 0) {
    log.log(LogLevel::Error, "cannot use descriptor %d of LISTEN_FDS: %s", chosen,
            systemText(errno));
    return {};
  }
  return socket;
}

}  // namespace tavrel
