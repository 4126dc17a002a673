// Devices that the kernel shows as folders with one number per file: sensors, batteries,
// regulators, memory controllers. A table says which files are figures.
#pragma once

#include <span>
#include <string_view>

#include "base/limits.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/live/live_source.h"
#include "platform/linux/live/text_table.h"

namespace tavrel::live {

/// One figure of a device. A '*' in `file` and `channel` stands for the same number.
struct Attribute {
  std::string_view file;
  std::string_view channel;
  Unit unit;
  Scale scale = {};
  Daily daily = kNotDaily;
};

struct DeviceClass {
  std::string_view className;
  std::string_view name;
  std::string_view group;
  std::string_view folder;
  std::string_view entry;  // prefix of the devices' folders
  /// File with a device's name; without one, the folder's name is used. Devices that share a name
  /// also get the name of the device they belong to, or of their folder.
  std::string_view label;
  bool alwaysWithDevice;
  Speed speed;
  std::span<const Attribute> attributes;
  std::span<const Attribute> partAttributes = {};  // of folders in a device's folder
};

void addDeviceClass(const DeviceRoot& root, const DeviceClass& devices, LiveSource& source);

/// The folders of devices below `folder`, and their names in channels. `entry` is what the names of
/// folders begin with; with a '*' at its end, only digits follow. When there are more than `limit`,
/// a note of the source says so.
struct NamedDevice {
  std::string path;
  std::string name;
};
std::vector<NamedDevice> devicesIn(const DeviceRoot& root, std::string_view folder,
                                   std::string_view entry, std::string_view label,
                                   bool alwaysWithDevice, LiveSource& source,
                                   std::size_t limit = limits::kLiveDevices);

/// The figures of one device.
void addAttributes(const std::string& path, const Place& place, const std::string& prefix,
                   std::span<const Attribute> attributes, Speed speed, LiveSource& source);

/// Whether `name` fits a pattern with at most one '*', which stands for digits; sets `number` to
/// them.
bool fitsPattern(std::string_view name, std::string_view pattern, std::string_view& number);

}  // namespace tavrel::live
