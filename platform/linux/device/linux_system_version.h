// What system the device runs: /etc/tavrel/system-version.plist or, where there is no such file,
// made from os-release.
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

  /// "name version (build)"; what is not known is left out, "unknown" when nothing is.
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

/// The value of `name` in the text of an os-release file, quotes and escapes resolved; a later
/// assignment wins.
std::optional<std::string> osReleaseValue(std::string_view text, std::string_view name);

}  // namespace tavrel
