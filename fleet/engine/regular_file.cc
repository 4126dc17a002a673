#include "fleet/engine/regular_file.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "base/system_text.h"
#include "fleet/engine/engine.h"
#include "platform/linux/files/descriptor.h"

namespace tavrel::fleet {
namespace {

[[noreturn]] void fail(const std::string& path, const std::string& advice) {
  throw EngineError(path + ": " + systemText(errno) + ": " + advice);
}

}  // namespace

std::optional<std::string> readBeginning(const std::string& path, std::size_t most) {
  const Descriptor file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY));
  if (!file && errno == ENOENT) return std::nullopt;
  if (!file) fail(path, "check owner and permissions of the file and its folder");
  constexpr const char* kBadFileSystem = "check the file system that holds it";
  struct stat status {};
  if (fstat(file.get(), &status) != 0) fail(path, kBadFileSystem);
  if (!S_ISREG(status.st_mode))
    throw EngineError(path + ": is not a regular file: name another file");
  std::string bytes(most, '\0');
  std::size_t size = 0;
  while (size < most) {
    const ssize_t got = read(file.get(), bytes.data() + size, most - size);
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) fail(path, kBadFileSystem);
    if (got == 0) break;
    size += static_cast<std::size_t>(got);
  }
  bytes.resize(size);
  return bytes;
}

}  // namespace tavrel::fleet
