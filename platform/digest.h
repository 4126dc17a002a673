// Message digests.
#pragma once

#include <array>
#include <cstddef>

#include "base/bytes.h"

namespace tavrel {

class Digest {
 public:
  virtual ~Digest() = default;
  virtual std::array<std::byte, 16> md5(ByteSpan bytes) = 0;
};

}  // namespace tavrel
