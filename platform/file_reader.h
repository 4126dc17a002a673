// Files of the device, by their path on the device.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "base/expected.h"

namespace tavrel {

class FileReader {
 public:
  virtual ~FileReader() = default;

  /// The whole content. A file larger than `largest` bytes counts as unreadable.
  virtual Expected<std::string> read(std::string_view path, std::size_t largest) = 0;

  /// Size in bytes; nothing when the file's status cannot be taken.
  virtual std::optional<std::int64_t> size(std::string_view path) = 0;
};

}  // namespace tavrel
