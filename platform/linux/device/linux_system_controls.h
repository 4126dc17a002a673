// System controls on Linux.
//
// Entries of /etc/tavrel/system-controls.plist under the device root, read once, take precedence:
// bytes, an integer in little-endian order over the whole buffer, or a failure as {"errno":
// NUMBER}. Otherwise "vm.swapusage" comes from the kernel, and "kern.next_ecc_event" from the queue
// of platform/linux/device/ecc_events.h. Other names do not exist (ENOENT).
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>

#include "platform/linux/device/ecc_events.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/property_list_coding.h"
#include "platform/system_controls.h"
#include "platform/system_log.h"

namespace tavrel {

inline constexpr std::size_t kSwapUsageBytes = 32;

/// The record of "vm.swapusage", little-endian: total, available and used swap in bytes (64 bits
/// each), the size of a page in bytes (32), and whether swap is encrypted (32, always 0).
std::array<std::byte, kSwapUsageBytes> swapUsageRecord(std::uint64_t total, std::uint64_t available,
                                                       std::uint32_t pageSize);

class LinuxSystemControls final : public SystemControls {
 public:
  LinuxSystemControls(const DeviceRoot& root, FileSystem& files, PropertyListCoding& propertyLists,
                      SystemLog& log, EccEvents& eccEvents)
      : root_(root),
        files_(files),
        propertyLists_(propertyLists),
        log_(log),
        eccEvents_(eccEvents) {}

  /// `buffer` keeps its content on failure.
  Result read(std::string_view name, MutableByteSpan buffer) override;

 private:
  Result answer(std::string_view name, const plist::Value& recorded, MutableByteSpan buffer);

  const DeviceRoot& root_;
  FileSystem& files_;
  PropertyListCoding& propertyLists_;
  SystemLog& log_;
  std::optional<plist::Dictionary> recorded_;
  EccEvents& eccEvents_;
};

}  // namespace tavrel
