// System controls by name.
#pragma once

#include <cstddef>
#include <string_view>

#include "base/bytes.h"

namespace tavrel {

class SystemControls {
 public:
  struct Result {
    int errorNumber;     // 0 for success
    std::size_t length;  // bytes written
  };

  virtual ~SystemControls() = default;

  /// Reads a control's value into `buffer`. A longer value fails with ENOMEM.
  virtual Result read(std::string_view name, MutableByteSpan buffer) = 0;
};

}  // namespace tavrel
