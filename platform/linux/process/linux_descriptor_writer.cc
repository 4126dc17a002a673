#include "platform/linux/process/linux_descriptor_writer.h"

#include <unistd.h>

namespace tavrel {

std::ptrdiff_t LinuxDescriptorWriter::write(int descriptor, ByteSpan bytes) {
  return ::write(descriptor, bytes.data(), bytes.size());
}

}  // namespace tavrel
