#include "platform/linux/line_reader.h"

#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

#include "base/limits.h"

namespace tavrel {

LineReader::LineReader(const std::string& path) {
  // Opening a pipe that nobody writes to would otherwise wait for a writer.
  descriptor_ = Descriptor(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY));
  struct stat status {};
  if (!descriptor_ || fstat(descriptor_.get(), &status) != 0) {
    errorNumber_ = errno;
  } else if (!S_ISREG(status.st_mode)) {
    errorNumber_ = EINVAL;
  } else {
    buffer_ = std::make_unique_for_overwrite<char[]>(limits::kTextLineBytes);
  }
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
  ssize_t count = 0;
  do {
    count = read(descriptor_.get(), buffer_.get() + end_, limits::kTextLineBytes - end_);
  } while (count < 0 && errno == EINTR);
  if (count < 0) errorNumber_ = errno;
  if (count <= 0) return false;
  end_ += static_cast<std::size_t>(count);
  return true;
}

}  // namespace tavrel
