#include "platform/linux/system_log/linux_standard_streams.h"

#include <cerrno>
#include <unistd.h>

namespace tavrel {
namespace {

// Ignores failures: there is nowhere to report them.
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
  if (!log_.isJournal()) return writeAll(STDERR_FILENO, text);
  if (text.ends_with('\n')) text.remove_suffix(1);  // each text is a message
  log_.write(LogLevel::Debug, text);
}

}  // namespace tavrel
