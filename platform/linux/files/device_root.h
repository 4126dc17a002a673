// The folder that holds the device's files.
//
// All paths of the device lie below it: "/" on a device, another folder in tests or when one
// machine hosts several devices.
//
//   const DeviceRoot root = DeviceRoot::fromEnvironment();
//   root.path("/etc/tavrel/device-answers.plist");
#pragma once

#include <string>
#include <string_view>

#include "base/expected.h"

namespace tavrel {

class DeviceRoot {
 public:
  explicit DeviceRoot(std::string root);

  /// The folder that TAVREL_ROOT names, otherwise "/".
  static DeviceRoot fromEnvironment();

  /// An error when the folder does not exist: services would otherwise create it.
  Status check() const;

  /// The path on this machine of a path on the device.
  std::string path(std::string_view devicePath) const;

  /// The same for files of the kernel or the machine that the root may lack: the path below the
  /// root when it exists, otherwise `devicePath` itself.
  std::string pathOrMachine(std::string_view devicePath) const;

 private:
  std::string root_;  // without a slash at its end; empty for "/"
};

}  // namespace tavrel
