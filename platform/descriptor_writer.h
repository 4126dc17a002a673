// Writing to descriptors of the process.
#pragma once

#include <cstddef>

#include "base/bytes.h"

namespace tavrel {

class DescriptorWriter {
 public:
  virtual ~DescriptorWriter() = default;

  /// One system call. Yields how many bytes it took, negative when it failed.
  virtual std::ptrdiff_t write(int descriptor, ByteSpan bytes) = 0;
};

}  // namespace tavrel
