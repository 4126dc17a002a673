#include "platform/linux/live/kernel_file.h"

#include <algorithm>
#include <climits>
#include <fcntl.h>
#include <memory>
#include <sys/resource.h>
#include <sys/stat.h>

#include "base/limits.h"

namespace tavrel::live {
namespace {

constexpr std::size_t kFirstBytes = 16U << 10;
constexpr std::size_t kLeastRoom = 4096;  // an attribute has at most one page
constexpr std::size_t kFallbackDescriptors = 256;

Descriptor openFile(const std::string& path) {
  // Non-blocking: in a folder that stands in for the kernel's, the file may be anything, even a
  // FIFO.
  return Descriptor(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOCTTY | O_NONBLOCK));
}

std::optional<std::string_view> readOpen(int descriptor, ReadMode mode, TextBuffer& buffer) {
  std::size_t length = 0;
  while (length < limits::kLiveFileBytes) {
    const std::span<char> room = buffer.roomBehind(length);
    const ssize_t count = pread(descriptor, room.data(), room.size(), static_cast<off_t>(length));
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) return std::nullopt;
    length += static_cast<std::size_t>(count);
    const bool isCut = static_cast<std::size_t>(count) == room.size();
    if (count == 0 || (mode == ReadMode::Once && !isCut)) break;
  }
  return buffer.text(length);
}

}  // namespace

std::span<char> TextBuffer::roomBehind(std::size_t length) {
  if (size_ < length + kLeastRoom) {
    const std::size_t size = std::max(kFirstBytes, 2 * size_);
    auto bytes = std::make_unique_for_overwrite<char[]>(size);
    std::copy_n(bytes_.get(), length, bytes.get());
    bytes_ = std::move(bytes);
    size_ = size;
  }
  return {bytes_.get() + length, size_ - length};
}

std::string_view TextBuffer::text(std::size_t length) {
  const std::string_view all(bytes_.get(), length);
  isCut_ = length >= limits::kLiveFileBytes;
  // The last number may lack digits.
  return isCut_ ? all.substr(0, all.rfind('\n') + 1) : all;
}

DescriptorBudget::DescriptorBudget() : left_(kFallbackDescriptors) {
  rlimit limit{};
  if (getrlimit(RLIMIT_NOFILE, &limit) == 0 && limit.rlim_cur != RLIM_INFINITY) {
    left_ = static_cast<std::size_t>(std::min<rlim_t>(limit.rlim_cur, INT_MAX) / 2);
  }
}

std::optional<std::string_view> readKernelFile(const std::string& path, ReadMode mode,
                                               TextBuffer& buffer) {
  const Descriptor descriptor = openFile(path);
  if (!descriptor) return std::nullopt;
  return readOpen(descriptor.get(), mode, buffer);
}

std::optional<std::string_view> KernelFile::read(DescriptorBudget& budget, TextBuffer& buffer) {
  if (descriptor_) {
    const auto text = readOpen(descriptor_.get(), mode_, buffer);
    // Reads fail once the device has gone; a new file with this name may belong to its successor.
    if (text || errno != ENODEV) return text;
    descriptor_.reset();
    budget.giveBack();
  }
  Descriptor opened = openFile(path_);
  if (!opened) return std::nullopt;
  const auto text = readOpen(opened.get(), mode_, buffer);
  if (text && budget.take()) descriptor_ = std::move(opened);
  return text;
}

std::string firstLine(const std::string& path) {
  TextBuffer buffer;
  const auto text = readKernelFile(path, ReadMode::Once, buffer);
  return text ? std::string(text->substr(0, text->find('\n'))) : std::string();
}

bool exists(const std::string& path) {
  return access(path.c_str(), F_OK) == 0;
}

bool isFolder(const std::string& path) {
  struct stat status {};
  return stat(path.c_str(), &status) == 0 && S_ISDIR(status.st_mode);
}

std::string linkedName(const std::string& path) {
  char target[PATH_MAX];
  const ssize_t length = readlink(path.c_str(), target, sizeof target);
  if (length <= 0) return {};
  const std::string_view text(target, static_cast<std::size_t>(length));
  return std::string(text.substr(text.rfind('/') + 1));
}

bool isOwnDevice(const std::string& folder) {
  const std::string device = folder + "/device";
  return exists(device) && !linkedName(device).starts_with("nvme-subsys");
}

}  // namespace tavrel::live
