// Files of the kernel, which are read again and again and stay open between readings.
#pragma once

#include <cstddef>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "platform/linux/files/descriptor.h"

namespace tavrel::live {

/// Descriptors that may stay open, for all files together: half of what the process may have.
class DescriptorBudget {
 public:
  DescriptorBudget();
  bool take() { return left_ > 0 && left_-- > 0; }
  void giveBack() { ++left_; }

 private:
  std::size_t left_;
};

enum class ReadMode : std::uint8_t {
  Once,   // a text that the kernel gives whole when there is room for it
  ToEnd,  // one that comes in parts
};

/// Room for the text of one file at a time. It grows, and is not cleared.
class TextBuffer {
 public:
  /// Room for more text behind the first `length` bytes, which stay.
  std::span<char> roomBehind(std::size_t length);
  std::string_view text(std::size_t length) const { return {bytes_.get(), length}; }

 private:
  std::unique_ptr<char[]> bytes_;
  std::size_t size_ = 0;
};

/// Reads a whole file of the kernel into `buffer`, at most `limits::kLiveFileBytes`. Nothing when
/// it cannot be opened or read. Opening does not wait for anybody.
std::optional<std::string_view> readKernelFile(const std::string& path, ReadMode mode,
                                               TextBuffer& buffer);

class KernelFile {
 public:
  KernelFile(std::string path, ReadMode mode) : path_(std::move(path)), mode_(mode) {}

  const std::string& path() const { return path_; }

  /// The text as it is now, in `buffer`. Reads through the descriptor of the reading before when
  /// the budget had one; a file that has meanwhile been replaced is opened again.
  std::optional<std::string_view> read(DescriptorBudget& budget, TextBuffer& buffer);

 private:
  std::string path_;
  ReadMode mode_;
  Descriptor descriptor_;
};

/// Names in a folder, sorted, without "." and ".."; none when it cannot be read.
std::vector<std::string> namesIn(const std::string& folder);

bool exists(const std::string& path);
bool isFolder(const std::string& path);
/// The last part of the link's target; empty when it is no link.
std::string linkedName(const std::string& path);

}  // namespace tavrel::live
