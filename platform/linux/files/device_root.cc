#include "platform/linux/files/device_root.h"

#include <cstdlib>
#include <unistd.h>
#include <utility>

#include "platform/linux/files/file_system.h"
#include "platform/linux/files/system_error.h"

namespace tavrel {

DeviceRoot::DeviceRoot(std::string root) : root_(std::move(root)) {
  while (!root_.empty() && root_.back() == '/')
    root_.pop_back();
}

DeviceRoot DeviceRoot::fromEnvironment() {
  const char* root = std::getenv("TAVREL_ROOT");
  return DeviceRoot(root ? root : "/");
}

Status DeviceRoot::check() const {
  const std::string folder = path("/");
  if (FileSystem::status(folder)) return Done{};
  Error error = systemError("use device root", folder);
  error.message += ": name the device's folder with TAVREL_ROOT";
  return error;
}

std::string DeviceRoot::path(std::string_view devicePath) const {
  std::string path = root_;
  if (!devicePath.starts_with('/')) path += '/';
  path += devicePath;
  return path;
}

std::string DeviceRoot::pathOrMachine(std::string_view devicePath) const {
  std::string below = path(devicePath);
  if (root_.empty() || ::access(below.c_str(), F_OK) == 0) return below;
  return std::string(devicePath);
}

}  // namespace tavrel
