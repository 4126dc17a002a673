#include "platform/linux/service/service_message.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <memory>
#include <poll.h>
#include <sys/mman.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <utility>
#include <vector>

#include "base/format.h"
#include "base/limits.h"
#include "base/system_text.h"
#include "platform/linux/files/descriptor.h"
#include "platform/plist/binary.h"
#include "platform/plist/coding.h"

namespace tavrel {

namespace {

constexpr int kNeededSeals = F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_WRITE;

Error systemFailure(const char* what) {
  return Error{format("%s: %s", what, systemText(errno))};
}

Expected<plist::Dictionary> readMessageFile(int file) {
  const int seals = fcntl(file, F_GET_SEALS);
  if (seals < 0) return Error{"the descriptor passed is not a memory file that can be sealed"};
  if ((seals & kNeededSeals) != kNeededSeals) {
    return Error{"the memory file is not sealed against shrinking, growing and writing"};
  }
  struct stat status;
  if (fstat(file, &status) != 0) return systemFailure("cannot take the memory file's size");
  const auto size = static_cast<std::uint64_t>(std::max<off_t>(status.st_size, 0));
  if (size > limits::kMessageFileBytes) {
    return Error{format("the memory file has %llu bytes, the limit is %llu", size,
                        std::uint64_t{limits::kMessageFileBytes})};
  }
  // Read, not mapped: a file of huge pages cannot be unmapped with its plain length.
  const auto bytes = static_cast<std::size_t>(size);
  const auto content = std::make_unique_for_overwrite<std::byte[]>(bytes);
  std::size_t length = 0;
  while (length < bytes) {
    const ssize_t count =
        pread(file, content.get() + length, bytes - length, static_cast<off_t>(length));
    if (count < 0 && errno == EINTR) continue;
    if (count <= 0) return systemFailure("cannot read the memory file");
    length += static_cast<std::size_t>(count);
  }
  return decodeMessage(ByteSpan(content.get(), bytes));
}

/// The descriptors that came with a packet.
std::vector<Descriptor> takeDescriptors(msghdr& header) {
  std::vector<Descriptor> descriptors;
  for (cmsghdr* part = CMSG_FIRSTHDR(&header); part; part = CMSG_NXTHDR(&header, part)) {
    if (part->cmsg_level != SOL_SOCKET || part->cmsg_type != SCM_RIGHTS) continue;
    const std::size_t count = (part->cmsg_len - CMSG_LEN(0)) / sizeof(int);
    for (std::size_t i = 0; i < count; ++i) {
      int descriptor = -1;
      std::memcpy(&descriptor, CMSG_DATA(part) + i * sizeof(int), sizeof(int));
      descriptors.emplace_back(descriptor);
    }
  }
  return descriptors;
}

/// Distinguishes the end of the connection from an empty packet, which reads the same.
bool hasEnded(int socket) {
  pollfd state{.fd = socket, .events = POLLRDHUP, .revents = 0};
  return poll(&state, 1, 0) != 0;
}

Received asReceived(Expected<plist::Dictionary> message) {
  if (!message) return message.error();
  return *std::move(message);
}

Expected<Descriptor> makeMessageFile(ByteSpan bytes) {
  Descriptor file(memfd_create("tavrel-message", MFD_CLOEXEC | MFD_ALLOW_SEALING));
  if (!file) return systemFailure("cannot make a memory file");
  while (!bytes.empty()) {
    const ssize_t count = write(file.get(), bytes.data(), bytes.size());
    if (count < 0 && errno == EINTR) continue;
    if (count <= 0) return systemFailure("cannot fill a memory file");
    bytes = bytes.subspan(static_cast<std::size_t>(count));
  }
  if (fcntl(file.get(), F_ADD_SEALS, kNeededSeals | F_SEAL_SEAL) != 0) {
    return systemFailure("cannot seal a memory file");
  }
  return file;
}

Status sendPacket(int socket, ByteSpan content, const Descriptor& file) {
  iovec part{.iov_base = const_cast<std::byte*>(content.data()), .iov_len = content.size()};
  alignas(cmsghdr) char control[CMSG_SPACE(sizeof(int))] = {};
  msghdr header{};
  header.msg_iov = &part;
  header.msg_iovlen = 1;
  if (file) {
    header.msg_control = control;
    header.msg_controllen = sizeof control;
    cmsghdr* rights = CMSG_FIRSTHDR(&header);
    rights->cmsg_level = SOL_SOCKET;
    rights->cmsg_type = SCM_RIGHTS;
    rights->cmsg_len = CMSG_LEN(sizeof(int));
    const int descriptor = file.get();
    std::memcpy(CMSG_DATA(rights), &descriptor, sizeof descriptor);
  }
  ssize_t sent;
  do {
    sent = sendmsg(socket, &header, MSG_NOSIGNAL);
  } while (sent < 0 && errno == EINTR);
  if (sent >= 0) return Done{};
  if (errno == EAGAIN) return Error{"cannot send the message: the service is not reading"};
  return systemFailure("cannot send the message");
}

}  // namespace

Expected<plist::Dictionary> decodeMessage(ByteSpan bytes) {
  const auto value = plist::read(bytes);
  if (!value) return value.error();
  if (value->kind() != plist::Kind::Dictionary) return Error{"the message is not a dictionary"};
  return value->dictionary();
}

Received receiveMessage(int socket, MutableByteSpan buffer) {
  iovec part{.iov_base = buffer.data(), .iov_len = buffer.size()};
  // Room for one descriptor: the kernel drops the rest and says so.
  alignas(cmsghdr) char control[CMSG_SPACE(sizeof(int))];
  msghdr header{};
  header.msg_iov = &part;
  header.msg_iovlen = 1;
  header.msg_control = control;
  header.msg_controllen = sizeof control;
  const ssize_t length = recvmsg(socket, &header, MSG_DONTWAIT | MSG_CMSG_CLOEXEC);
  if (length < 0) {
    if (errno == EAGAIN || errno == EINTR) return NoMessage{};
    if (errno == ECONNRESET) return ConnectionClosed{};
    return systemFailure("cannot receive");
  }
  const std::vector<Descriptor> descriptors = takeDescriptors(header);
  if ((header.msg_flags & MSG_TRUNC) != 0) {
    return Error{
        format("the packet is larger than %llu bytes; send such a message in a memory file",
               std::uint64_t{buffer.size()})};
  }
  if ((header.msg_flags & MSG_CTRUNC) != 0 || descriptors.size() > 1) {
    return Error{"not exactly one descriptor came with the packet, or none could be opened here"};
  }
  if (descriptors.size() == 1) {
    if (length != 0) return Error{"a packet that passes a memory file must be empty"};
    return asReceived(readMessageFile(descriptors.front().get()));
  }
  if (length == 0) {
    if (hasEnded(socket)) return ConnectionClosed{};
    return Error{"the packet is empty"};
  }
  return asReceived(decodeMessage(buffer.first(static_cast<std::size_t>(length))));
}

Status sendMessage(int socket, const plist::Dictionary& message) {
  const auto encoded = plist::writeBinary(message);
  if (!encoded) return encoded.error();
  const ByteSpan bytes = asBytes(*encoded);
  if (bytes.size() <= limits::kPacketBytes) return sendPacket(socket, bytes, Descriptor());
  if (bytes.size() > limits::kMessageFileBytes) {
    return Error{format("the message has %llu bytes, the limit is %llu",
                        std::uint64_t{bytes.size()}, std::uint64_t{limits::kMessageFileBytes})};
  }
  const auto file = makeMessageFile(bytes);
  if (!file) return file.error();
  return sendPacket(socket, {}, *file);
}

}  // namespace tavrel
