// Writes to the process's file descriptors.
#pragma once

#include <cstddef>

#include "base/bytes.h"

namespace tavrel {

class DescriptorWriter {
 public:
  virtual ~DescriptorWriter() = default;

  /// Makes one system call. Returns the number of bytes written, negative on failure.
  virtual std::ptrdiff_t write(int descriptor, ByteSpan bytes) = 0;
};

}  // namespace tavrel
