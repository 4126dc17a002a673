// The system that the device runs, from /etc/tavrel/system-version.plist or, without that file,
// from os-release.
#pragma once

#include <optional>
#include <string>

#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/property_list_coding.h"
#include "platform/system_log.h"
#include "platform/system_version.h"

namespace tavrel {

class LinuxSystemVersion final : public SystemVersion {
 public:
  LinuxSystemVersion(const DeviceRoot& root, FileSystem& files, PropertyListCoding& propertyLists,
                     SystemLog& log)
      : root_(root), files_(files), propertyLists_(propertyLists), log_(log) {}

  plist::Dictionary systemVersionDictionary() override;

  /// "name version (build)" without unknown parts; `kUnknownOSVersion` when all are.
  std::string text();

 private:
  const plist::Dictionary& known();
  plist::Dictionary fromOsRelease();

  const DeviceRoot& root_;
  FileSystem& files_;
  PropertyListCoding& propertyLists_;
  SystemLog& log_;
  plist::Dictionary known_;
};

/// The value of `name` in the text of an os-release file, with quotes and escapes resolved; a later
/// assignment wins.
std::optional<std::string> osReleaseValue(std::string_view text, std::string_view name);

}  // namespace tavrel
