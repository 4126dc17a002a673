// Lines of a text file, read in one pass with a buffer of fixed size.
//
//   LineReader lines(path);
//   while (const auto line = lines.next()) use(*line);
//   if (lines.errorNumber() != 0) ...
#pragma once

#include <cstddef>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "platform/linux/descriptor.h"

namespace tavrel {

class LineReader {
 public:
  /// Only regular files are read; a folder, a pipe or a device fails with EINVAL.
  explicit LineReader(const std::string& path);

  /// The next line without its end, valid until the next call. A line that is longer than
  /// `limits::kTextLineBytes` is cut. Nothing at the end of the file and after a failure.
  std::optional<std::string_view> next();

  /// Why the file could not be opened or read on, 0 when nothing failed.
  int errorNumber() const { return errorNumber_; }

 private:
  bool fill();

  Descriptor descriptor_;
  int errorNumber_ = 0;
  std::unique_ptr<char[]> buffer_;
  std::size_t begin_ = 0;
  std::size_t end_ = 0;
  bool insideCutLine_ = false;
};

}  // namespace tavrel
