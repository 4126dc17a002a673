// The folder that holds the device's files.
//
// Every path of the device lies below it: "/" on a device, another folder in tests and where one
// machine carries several devices.
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

  /// The folder that TAVREL_ROOT names, else "/".
  static DeviceRoot fromEnvironment();

  /// An error when the folder is not there or may not be entered. Services would make it.
  Status check() const;

  /// The path on this machine of a path on the device.
  std::string path(std::string_view devicePath) const;

  /// The same for what the kernel or the machine answers when the root does not hold it: the path
  /// below the root when something is there, else `devicePath` itself.
  std::string pathOrMachine(std::string_view devicePath) const;

 private:
  std::string root_;  // without a slash at its end; empty for "/"
};

}  // namespace tavrel
