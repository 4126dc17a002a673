#include "platform/linux/files/boot_id.h"

#include "base/limits.h"
#include "platform/linux/files/file_system.h"

namespace tavrel {

std::string bootIDOf(const DeviceRoot& root) {
  const auto text = FileSystem().read(root.pathOrMachine(kBootIDFile), limits::kSystemFactBytes);
  return text ? text->substr(0, text->find_first_of(" \n")) : std::string();
}

}  // namespace tavrel
