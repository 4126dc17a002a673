// Message digests by libmd.
#pragma once

#include "platform/digest.h"

namespace tavrel {

class LinuxDigest final : public Digest {
 public:
  std::array<std::byte, 16> md5(ByteSpan bytes) override;
};

std::array<std::byte, 32> sha256(ByteSpan bytes);

}  // namespace tavrel
