// The drives of the machine whose health can be read, as sysfs shows them.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "base/expected.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/health/figure.h"

namespace tavrel::health {

/// Where sysfs and the device files are. A device root with a folder "sys" stands in for the
/// machine, with its own "dev".
struct Machine {
  explicit Machine(const DeviceRoot& root);
  std::string sys;
  std::string dev;
};

struct Drive {
  std::string name;  // the kernel's: "nvme0", "mmcblk0", "sda", "mtd0", "ubi0"; "ufs0" for UFS
  DriveKind kind;
  std::string folder;      // in sysfs
  std::string deviceFile;  // for commands; empty where none are needed
  std::string model;
  std::string firmware;
  std::string serial;                    // never leaves the reader
  std::optional<std::int64_t> capacity;  // bytes
};

/// By kind and number. An error when a folder of sysfs cannot be listed, or when the attribute that
/// says what a drive is cannot be read.
Expected<std::vector<Drive>> findDrives(const Machine& machine);

}  // namespace tavrel::health
