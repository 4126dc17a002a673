#include "platform/linux/files/line_reader.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

#include "base/limits.h"

namespace tavrel {
namespace {

/// For reading. Without /proc it fails with ENOTSUP. Never waits: a user may hold a lease on the
/// file, and some regular files of the kernel block readers.
Descriptor reopen(const Descriptor& found) {
  const std::string path = "/proc/self/fd/" + std::to_string(found.get());
  Descriptor descriptor(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY));
  if (!descriptor && errno == ENOENT) errno = ENOTSUP;
  return descriptor;
}

}  // namespace

LineReader::LineReader(const std::string& path, std::uint64_t largest)
    : left_(largest), errorNumber_(begin(path, largest)) {}

int LineReader::begin(const std::string& path, std::uint64_t largest) {
  // The path may be a user's link to a device, and opening some devices has an effect: a watchdog
  // starts. So look first, and open only what was found.
  const Descriptor found(open(path.c_str(), O_PATH | O_CLOEXEC));
  struct stat status {};
  if (!found || fstat(found.get(), &status) != 0) return errno;
  if (!S_ISREG(status.st_mode)) return EINVAL;
  if (static_cast<std::uint64_t>(status.st_size) > largest) return EFBIG;
  descriptor_ = reopen(found);
  if (!descriptor_) return errno;
  buffer_ = std::make_unique_for_overwrite<char[]>(limits::kTextLineBytes);
  return 0;
}

std::optional<std::string_view> LineReader::next() {
  if (errorNumber_ != 0) return std::nullopt;
  while (true) {
    const std::string_view rest(buffer_.get() + begin_, end_ - begin_);
    const std::size_t newline = rest.find('\n');
    if (newline != std::string_view::npos) {
      begin_ += newline + 1;
      if (std::exchange(insideCutLine_, false)) continue;
      return rest.substr(0, newline);
    }
    if (rest.size() == limits::kTextLineBytes) {
      begin_ = end_ = 0;
      if (std::exchange(insideCutLine_, true)) continue;
      return rest;
    }
    if (!fill()) {
      begin_ = end_ = 0;
      if (errorNumber_ != 0 || rest.empty() || insideCutLine_) return std::nullopt;
      return std::string_view(buffer_.get(), rest.size());
    }
  }
}

bool LineReader::fill() {
  std::memmove(buffer_.get(), buffer_.get() + begin_, end_ - begin_);
  end_ -= begin_;
  begin_ = 0;
  const std::size_t room =
      static_cast<std::size_t>(std::min<std::uint64_t>(limits::kTextLineBytes - end_, left_));
  ssize_t count = 0;
  do {
    count = read(descriptor_.get(), buffer_.get() + end_, room);
  } while (count < 0 && errno == EINTR);
  if (count < 0) errorNumber_ = errno;
  if (count <= 0) return false;
  end_ += static_cast<std::size_t>(count);
  left_ -= static_cast<std::uint64_t>(count);
  return true;
}

}  // namespace tavrel
