// Commands to drives. An interface, so that tests can answer in place of hardware.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "base/expected.h"

namespace tavrel::health {

class DeviceCommands {
 public:
  using Bytes = std::vector<std::byte>;
  virtual ~DeviceCommands() = default;

  /// A log page of the controller whose device file is `path`; empty when the drive answers that it
  /// has no such page. Needs CAP_SYS_ADMIN.
  virtual Expected<Bytes> nvmeLog(const std::string& path, std::uint8_t page) = 0;
  /// The EXT_CSD register. `path` names the whole card, not a partition. Needs CAP_SYS_RAWIO.
  virtual Expected<Bytes> extCsd(const std::string& path) = 0;
  /// SMART data as a libatasmart blob; empty when the disk is spun down.
  virtual Expected<Bytes> ataSmart(const std::string& path) = 0;
};

class LinuxDeviceCommands final : public DeviceCommands {
 public:
  Expected<Bytes> nvmeLog(const std::string& path, std::uint8_t page) override;
  Expected<Bytes> extCsd(const std::string& path) override;
  Expected<Bytes> ataSmart(const std::string& path) override;
};

}  // namespace tavrel::health
