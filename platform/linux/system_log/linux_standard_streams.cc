#include "platform/linux/process/linux_standard_streams.h"

#include <cerrno>
#include <unistd.h>

namespace tavrel {
namespace {

// Nobody could be told of a failure.
void writeAll(int descriptor, std::string_view text) {
  while (!text.empty()) {
    const ssize_t written = ::write(descriptor, text.data(), text.size());
    if (written < 0 && errno == EINTR) continue;
    if (written <= 0) return;
    text.remove_prefix(static_cast<std::size_t>(written));
  }
}

}  // namespace

void LinuxStandardStreams::writeOutput(std::string_view text) {
  writeAll(STDOUT_FILENO, text);
}

void LinuxStandardStreams::writeError(std::string_view text) {
  writeAll(STDERR_FILENO, text);
}

}  // namespace tavrel
