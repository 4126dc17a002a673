// The floor of the StatsD program: receives datagrams from descriptor 3 and drops them.
#include <poll.h>
#include <sys/socket.h>

int main() {
  constexpr unsigned kBatch = 32;
  static char bytes[kBatch][9216];
  static iovec parts[kBatch];
  static mmsghdr messages[kBatch];
  for (unsigned i = 0; i < kBatch; ++i) {
    parts[i] = {bytes[i], sizeof bytes[i]};
    messages[i].msg_hdr.msg_iov = &parts[i];
    messages[i].msg_hdr.msg_iovlen = 1;
  }
  pollfd socket{3, POLLIN, 0};
  while (poll(&socket, 1, -1) > 0)
    recvmmsg(3, messages, kBatch, MSG_DONTWAIT, nullptr);
}
