#include "platform/linux/live/attribute_class.h"

#include <algorithm>
#include <unordered_map>

#include "base/ascii.h"
#include "base/format.h"

namespace tavrel::live {
namespace {

std::string withNumber(std::string_view pattern, std::string_view number) {
  std::string text(pattern);
  if (const auto star = text.find('*'); star != std::string::npos) text.replace(star, 1, number);
  return text;
}

// Files with the device's power state: reading the sensor of a sleeping drive would wake it.
std::vector<std::string> powerStatusOf(const std::string& path) {
  std::vector<std::string> files;
  for (const char* const file :
       {"/device/power/runtime_status", "/device/device/power/runtime_status"}) {
    if (exists(path + file)) files.push_back(path + file);
  }
  return files;
}

}  // namespace

bool fitsPattern(std::string_view name, std::string_view pattern, std::string_view& number) {
  number = {};
  const std::size_t star = pattern.find('*');
  if (star == std::string_view::npos) return name == pattern;
  const std::string_view head = pattern.substr(0, star);
  const std::string_view tail = pattern.substr(star + 1);
  if (name.size() <= head.size() + tail.size()) return false;
  if (!name.starts_with(head) || !name.ends_with(tail)) return false;
  number = name.substr(head.size(), name.size() - head.size() - tail.size());
  return std::all_of(number.begin(), number.end(), isDigit);
}

std::vector<NamedDevice> devicesIn(const DeviceRoot& root, std::string_view folder,
                                   std::string_view entry, std::string_view label,
                                   bool alwaysWithDevice, LiveSource& source, std::size_t limit) {
  const std::string base = root.path(folder);
  std::vector<NamedDevice> devices;
  std::vector<std::string> entries;
  std::unordered_map<std::string, std::size_t> counts;
  for (std::string& name : source.namesIn(base)) {
    std::string_view number;
    const bool isDevice =
        entry.ends_with('*') ? fitsPattern(name, entry, number) : name.starts_with(entry);
    if (!isDevice) continue;
    if (devices.size() == limit) {
      source.note(format("%s: only the first %zu devices are shown", base, devices.size()));
      break;
    }
    std::string path = base + '/' + name;
    std::string called = label.empty() ? name : firstLine(path + '/' + std::string(label));
    if (called.empty()) called = name;
    ++counts[called];
    devices.push_back({std::move(path), std::move(called)});
    entries.push_back(std::move(name));
  }
  for (std::size_t i = 0; i < devices.size(); ++i) {
    std::string& name = devices[i].name;
    if (alwaysWithDevice || counts[name] > 1) {
      const std::string owner = linkedName(devices[i].path + "/device");
      if (!owner.empty()) {
        name += '@' + owner;
      } else if (counts[name] > 1) {
        name += '@' + entries[i];
      }
    }
    name = channelName(name);
  }
  return devices;
}

void addAttributes(const std::string& path, const Place& place, const std::string& prefix,
                   std::span<const Attribute> attributes, Speed speed, LiveSource& source) {
  const auto add = [&](const Attribute& attribute, const std::string& file, std::string_view number,
                       const std::vector<std::string>& powerStatus) {
    const std::uint32_t slot = source.addNumberFile(file, attribute.scale, speed, powerStatus);
    source.addSimple({place.group, place.subGroup, attribute.unit},
                     prefix + withNumber(attribute.channel, number), slot,
                     attribute.daily.isItself ? kDailyCategory : kToolCategory);
    if (!attribute.daily.fold.empty()) {
      source.addToFold(attribute.daily.fold, attribute.unit, attribute.daily.how, slot);
    }
  };
  const std::vector<std::string> powerStatus =
      speed == Speed::Slow ? powerStatusOf(path) : std::vector<std::string>();
  const std::vector<std::string> names = source.namesIn(path);
  for (const Attribute& attribute : attributes) {
    if (attribute.file.find('/') != std::string_view::npos) {
      std::string file = path + '/' + std::string(attribute.file);
      if (exists(file)) add(attribute, file, {}, powerStatus);
      continue;
    }
    // Names are sorted, so matching ones are adjacent.
    const std::string_view head = attribute.file.substr(0, attribute.file.find('*'));
    auto name = std::lower_bound(names.begin(), names.end(), head);
    for (; name != names.end() && name->starts_with(head); ++name) {
      std::string_view number;
      if (fitsPattern(*name, attribute.file, number)) {
        add(attribute, path + '/' + *name, number, powerStatus);
      }
    }
  }
}

void addDeviceClass(const DeviceRoot& root, const DeviceClass& devices, LiveSource& source) {
  for (const NamedDevice& device : devicesIn(root, devices.folder, devices.entry, devices.label,
                                             devices.alwaysWithDevice, source)) {
    addAttributes(device.path, {devices.group, device.name, kPlain}, device.name + '.',
                  devices.attributes, devices.speed, source);
    if (devices.partAttributes.empty()) continue;
    for (const std::string& part : source.namesIn(device.path)) {
      addAttributes(device.path + '/' + part, {devices.group, device.name, kPlain},
                    device.name + '.' + channelName(part) + '.', devices.partAttributes,
                    devices.speed, source);
    }
  }
}

}  // namespace tavrel::live
