// write(2).
#pragma once

#include "platform/descriptor_writer.h"

namespace tavrel {

class LinuxDescriptorWriter final : public DescriptorWriter {
 public:
  std::ptrdiff_t write(int descriptor, ByteSpan bytes) override;
};

}  // namespace tavrel
