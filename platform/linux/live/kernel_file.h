// Kernel files, which are read repeatedly and stay open between readings.
#pragma once

#include <cstddef>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <string_view>

#include "platform/linux/files/descriptor.h"

namespace tavrel::live {

/// How many descriptors may stay open for all files together: half of the process's limit.
class DescriptorBudget {
 public:
  DescriptorBudget();
  bool take() { return left_ > 0 && left_-- > 0; }
  void giveBack() { ++left_; }

 private:
  std::size_t left_;
};

enum class ReadMode : std::uint8_t {
  Once,   // the kernel returns the whole text if it fits
  ToEnd,  // the text comes in parts
};

/// Memory for the text of one file at a time. It grows as needed and is not cleared.
class TextBuffer {
 public:
  /// Space for more text after the first `length` bytes, which are kept.
  std::span<char> roomBehind(std::size_t length);
  /// The first `length` bytes; of `limits::kLiveFileBytes` and more, only the whole lines.
  std::string_view text(std::size_t length);
  /// Whether the last text was cut in that way.
  bool isCut() const { return isCut_; }

 private:
  std::unique_ptr<char[]> bytes_;
  std::size_t size_ = 0;
  bool isCut_ = false;
};

/// Reads a whole file of the kernel into `buffer`, or its first lines, when it has more than
/// `limits::kLiveFileBytes`. Nothing when it cannot be opened or read. Opening never blocks.
std::optional<std::string_view> readKernelFile(const std::string& path, ReadMode mode,
                                               TextBuffer& buffer);

class KernelFile {
 public:
  KernelFile(std::string path, ReadMode mode) : path_(std::move(path)), mode_(mode) {}

  const std::string& path() const { return path_; }

  /// The text as it is now, in `buffer`. Reuses the descriptor of the last read when the budget had
  /// one, until the device of the file has gone.
  std::optional<std::string_view> read(DescriptorBudget& budget, TextBuffer& buffer);

 private:
  std::string path_;
  ReadMode mode_;
  Descriptor descriptor_;
};

/// The first line of a file, without its end; empty when it cannot be read.
std::string firstLine(const std::string& path);

bool exists(const std::string& path);
bool isFolder(const std::string& path);
/// The last part of the link's target; empty when it is not a link.
std::string linkedName(const std::string& path);
/// Whether a disk or interface, given its folder in sysfs, is a device of its own. A disk that NVMe
/// makes of several paths is not: the paths are, each with a disk that counts.
bool isOwnDevice(const std::string& folder);

}  // namespace tavrel::live
