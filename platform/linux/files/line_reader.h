// Lines of a text file, read in one pass with a buffer of fixed size.
//
//   LineReader lines(path);
//   while (const auto line = lines.next()) use(*line);
//   if (lines.errorNumber() != 0) ...
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "platform/linux/files/descriptor.h"

namespace tavrel {

class LineReader {
 public:
  /// Only regular files are opened; a folder, a pipe or a device fails with EINVAL, a file of more
  /// than `largest` bytes with EFBIG.
  explicit LineReader(const std::string& path, std::uint64_t largest = UINT64_MAX);

  /// The next line without its end, valid until the next call. A line that is longer than
  /// `limits::kTextLineBytes` is cut. Nothing at the end of the file or after a failure.
  std::optional<std::string_view> next();

  /// Why the file could not be opened or read; 0 when nothing failed.
  int errorNumber() const { return errorNumber_; }

 private:
  int begin(const std::string& path, std::uint64_t largest);
  bool fill();

  Descriptor descriptor_;
  std::uint64_t left_;  // bytes that may still be read if the file grows
  std::unique_ptr<char[]> buffer_;
  std::size_t begin_ = 0;
  std::size_t end_ = 0;
  bool insideCutLine_ = false;
  int errorNumber_;
};

}  // namespace tavrel
