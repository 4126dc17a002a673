// Devices that the kernel shows as folders with one number in each file: sensors, batteries,
// regulators, memory controllers. A table says which files are figures.
#pragma once

#include <span>
#include <string_view>

#include "platform/linux/files/device_root.h"
#include "platform/linux/live/live_source.h"
#include "platform/linux/live/text_table.h"

namespace tavrel::live {

/// One figure of a device. In the names of file and channel '*' stands for the same number.
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
  std::string_view entry;  // how the folders of devices begin
  /// File with a device's name; without one, the folder's name serves. Devices of one name also
  /// get that of the device that they belong to, or their folder's.
  std::string_view label;
  bool alwaysWithDevice;
  Speed speed;
  std::span<const Attribute> attributes;
  std::string_view part = {};  // how folders of parts of a device begin
  std::span<const Attribute> partAttributes = {};
};

void addDeviceClass(const DeviceRoot& root, const DeviceClass& devices, LiveSource& source);

/// The folders of devices below `folder` and the names that channels have for them. Notes of the
/// source say when there are more than are shown.
struct NamedDevice {
  std::string path;
  std::string name;
};
std::vector<NamedDevice> devicesIn(const DeviceRoot& root, std::string_view folder,
                                   std::string_view entry, std::string_view label,
                                   bool alwaysWithDevice, LiveSource& source);

/// The figures of one device.
void addAttributes(const std::string& path, const Place& place, const std::string& prefix,
                   std::span<const Attribute> attributes, Speed speed, LiveSource& source);

/// Whether `name` fits a pattern with at most one '*', which stands for digits; those are `number`.
bool fitsPattern(std::string_view name, std::string_view pattern, std::string_view& number);

}  // namespace tavrel::live
