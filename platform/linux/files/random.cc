#include "platform/linux/files/random.h"

#include <array>
#include <cerrno>
#include <sys/random.h>
#include <time.h>
#include <unistd.h>

#include "base/text.h"
#include "base/uuid.h"

namespace tavrel {
namespace {

/// A fallback when the kernel has no random bytes: names still differ by process, time and count.
void fillDistinct(MutableByteSpan bytes) {
  static std::uint64_t count = 0;
  timespec now{};
  clock_gettime(CLOCK_MONOTONIC, &now);
  std::uint64_t state = static_cast<std::uint64_t>(now.tv_sec) * 1'000'000'000U +
                        static_cast<std::uint64_t>(now.tv_nsec);
  state ^= static_cast<std::uint64_t>(getpid()) << 40;
  state += ++count;
  for (std::byte& byte : bytes) {
    state = state * 6364136223846793005U + 1442695040888963407U;
    byte = static_cast<std::byte>(state >> 56);
  }
}

}  // namespace

void fillRandom(MutableByteSpan bytes) {
  while (!bytes.empty()) {
    const ssize_t filled = getrandom(bytes.data(), bytes.size(), 0);
    if (filled < 0) {
      if (errno == EINTR) continue;
      return fillDistinct(bytes);
    }
    bytes = bytes.subspan(static_cast<std::size_t>(filled));
  }
}

std::string randomName() {
  std::array<std::byte, 8> bytes;
  fillRandom(bytes);
  std::string name;
  appendHex(name, bytes);
  return name;
}

std::string randomUuidText() {
  std::array<std::byte, 16> bytes;
  fillRandom(bytes);
  bytes[6] = (bytes[6] & std::byte{0x0F}) | std::byte{0x40};
  bytes[8] = (bytes[8] & std::byte{0x3F}) | std::byte{0x80};
  return uuidText(bytes);
}

}  // namespace tavrel
