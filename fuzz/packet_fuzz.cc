// Packets of the named service. The first byte chooses how the rest is sent: as the packet itself,
// or in a memory file with some of the seals.
#include <array>
#include <cstdint>
#include <cstring>
#include <fcntl.h>
#include <memory>
#include <sys/mman.h>
#include <sys/socket.h>
#include <unistd.h>

#include "base/limits.h"
#include "platform/linux/files/descriptor.h"
#include "platform/linux/service/service_message.h"
#include "require.h"

namespace {

using tavrel::ByteSpan;
using tavrel::fuzz::require;

constexpr int kAllSeals = F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_WRITE;

/// Both ends of one connection serve all inputs; nothing in it may be left for a later input.
struct Connection {
  Connection() {
    std::array<int, 2> ends{};
    require(socketpair(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0, ends.data()) == 0);
    sender = tavrel::Descriptor(ends[0]);
    receiver = tavrel::Descriptor(ends[1]);
  }
  tavrel::Descriptor sender;
  tavrel::Descriptor receiver;
};

void sendPacket(int socket, ByteSpan content, int file) {
  iovec part{const_cast<std::byte*>(content.data()), content.size()};
  alignas(cmsghdr) char control[CMSG_SPACE(sizeof(int))] = {};
  msghdr header{};
  header.msg_iov = &part;
  header.msg_iovlen = 1;
  if (file >= 0) {
    header.msg_control = control;
    header.msg_controllen = sizeof control;
    cmsghdr* rights = CMSG_FIRSTHDR(&header);
    rights->cmsg_level = SOL_SOCKET;
    rights->cmsg_type = SCM_RIGHTS;
    rights->cmsg_len = CMSG_LEN(sizeof(int));
    std::memcpy(CMSG_DATA(rights), &file, sizeof file);
  }
  require(sendmsg(socket, &header, 0) == static_cast<ssize_t>(content.size()));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static const Connection connection;
  static const auto buffer = std::make_unique<std::byte[]>(tavrel::limits::kPacketBytes);
  if (size < 2 || size > tavrel::limits::kPacketBytes) return 0;
  const ByteSpan content = std::as_bytes(std::span(data + 1, size - 1));
  const bool inFile = (data[0] & 1U) != 0;
  const int seals = kAllSeals & (data[0] & 0xFE);

  tavrel::Descriptor file;
  if (inFile) {
    file = tavrel::Descriptor(memfd_create("fuzz", MFD_CLOEXEC | MFD_ALLOW_SEALING));
    require(write(file.get(), content.data(), content.size()) ==
            static_cast<ssize_t>(content.size()));
    require(fcntl(file.get(), F_ADD_SEALS, seals) == 0);
  }
  sendPacket(connection.sender.get(), inFile ? ByteSpan() : content, file.get());
  const auto received =
      tavrel::receiveMessage(connection.receiver.get(),
                             tavrel::MutableByteSpan(buffer.get(), tavrel::limits::kPacketBytes));

  const auto expected = tavrel::decodeMessage(content);
  if (expected && (!inFile || seals == kAllSeals)) {
    const auto* message = std::get_if<tavrel::plist::Dictionary>(&received);
    require(message && tavrel::plist::Value(*message) == tavrel::plist::Value(*expected));
  } else {
    require(std::holds_alternative<tavrel::Error>(received));
  }
  return 0;
}
