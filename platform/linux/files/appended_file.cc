#include <algorithm>
#include <array>
#include <cerrno>
#include <unistd.h>

#include "platform/linux/files/file_system.h"
#include "platform/linux/files/system_error.h"

namespace tavrel {
namespace {

/// Where the whole lines of a file end; -1 with `errno` when it cannot be read. Only zero bytes,
/// line ends and a line without an end may follow.
off_t endOfWholeLines(int descriptor, off_t size) {
  std::array<char, 4096> block;
  off_t lineEnd = 0;  // the end of the current line; 0 when it has none
  for (off_t end = size; end > 0;) {
    const off_t begin = std::max<off_t>(end - static_cast<off_t>(block.size()), 0);
    const auto length = static_cast<std::size_t>(end - begin);
    const ssize_t got = pread(descriptor, block.data(), length, begin);
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) return -1;
    for (ssize_t i = got - 1; i >= 0; --i) {
      const char byte = block[static_cast<std::size_t>(i)];
      if (byte == '\n') {
        lineEnd = begin + i + 1;
      } else if (byte != '\0' && lineEnd != 0) {
        return lineEnd;
      }
    }
    end = begin;
  }
  return 0;
}

}  // namespace

Status AppendedFile::cutTornEnd(std::int64_t size) {
  const off_t whole = endOfWholeLines(descriptor_.get(), size);
  if (whole < 0) return systemError("read", path_);
  size_ = static_cast<std::uint64_t>(whole);
  isTorn_ = whole != size;
  return mend();
}

Status AppendedFile::mend() {
  if (!isTorn_) return Done{};
  if (fileSystem_->truncateFile(descriptor_.get(), static_cast<off_t>(size_)) != 0) {
    return systemError("cut the torn end off", path_);
  }
  isTorn_ = false;
  return Done{};
}

Status AppendedFile::append(ByteSpan bytes, std::size_t largest) {
  if (bytes.size() > largest || size_ > largest - bytes.size()) {
    return Error{"cannot append to " + path_ + ": it would exceed its limit of " +
                 std::to_string(largest) + " bytes; move it away"};
  }
  if (Status mended = mend(); !mended) return mended;
  isFlushed_ = false;
  if (Status written = fileSystem_->writeAll(descriptor_.get(), bytes, path_); !written) {
    isTorn_ = true;
    static_cast<void>(mend());
    return written;
  }
  size_ += bytes.size();
  return Done{};
}

Status AppendedFile::flush() {
  if (isFlushed_) return Done{};
  if (fileSystem_->syncFile(descriptor_.get()) != 0) return systemError("flush", path_);
  if (!isNameFlushed_) {
    if (Status named = fileSystem_->syncFolderOf(path_); !named) return named;
  }
  isFlushed_ = isNameFlushed_ = true;
  return Done{};
}

}  // namespace tavrel
