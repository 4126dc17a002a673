#include "platform/linux/health/device_commands.h"

#include <fcntl.h>
#include <linux/mmc/ioctl.h>
#include <linux/nvme_ioctl.h>
#include <memory>
#include <sys/ioctl.h>
#include <sys/stat.h>

#include "base/format.h"
#include "platform/linux/files/descriptor.h"
#include "platform/linux/files/system_error.h"
#include "platform/linux/health/ata_library.h"
#include "platform/linux/health/flash_life.h"
#include "platform/linux/health/nvme_logs.h"

namespace tavrel::health {
namespace {

constexpr std::uint8_t kGetLogPage = 0x02;
constexpr std::uint32_t kAllNamespaces = 0xFFFFFFFF;
// Without this bit, the read would clear an event that another reader waits for.
constexpr std::uint32_t kRetainEvent = 1U << 15;
constexpr std::uint32_t kMilliseconds = 5'000;

// Status codes with their type, without the bits that say what to do.
constexpr int kStatusCode = 0x7FF;
constexpr int kInvalidField = 0x002;
constexpr int kInvalidLogPage = 0x109;

constexpr std::uint32_t kSendExtCsd = 8;
// Response R1 (present, with checksum and command index) on both buses, and data that follows.
constexpr std::uint32_t kResponseWithData = 1U << 0 | 1U << 2 | 1U << 4 | 1U << 5 | 1U << 7;

Expected<Descriptor> openDevice(const std::string& path, mode_t kind) {
  Descriptor device(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY));
  if (!device) return systemError("open", path);
  struct stat status {};
  if (fstat(device.get(), &status) != 0) return systemError("examine", path);
  if ((status.st_mode & S_IFMT) != kind) {
    return Error{format("cannot open %s: not the device that it is named after", path)};
  }
  return device;
}

std::uint64_t addressOf(DeviceCommands::Bytes& bytes) {
  return reinterpret_cast<std::uintptr_t>(bytes.data());
}

}  // namespace

Expected<DeviceCommands::Bytes> LinuxDeviceCommands::nvmeLog(const std::string& path,
                                                             std::uint8_t page) {
  const auto device = openDevice(path, S_IFCHR);
  if (!device) return device.error();
  Bytes bytes(kNvmeLogBytes);
  nvme_admin_cmd command{};
  command.opcode = kGetLogPage;
  command.nsid = kAllNamespaces;
  command.addr = addressOf(bytes);
  command.data_len = kNvmeLogBytes;
  command.cdw10 = page | kRetainEvent | (kNvmeLogBytes / 4 - 1) << 16;
  command.timeout_ms = kMilliseconds;
  const int status = ioctl(device->get(), NVME_IOCTL_ADMIN_CMD, &command);
  if (status < 0) return systemError(format("read log %02Xh of", page), path);
  const int code = status & kStatusCode;
  if (status > 0 && (code == kInvalidField || code == kInvalidLogPage)) return Bytes();
  if (status > 0) {
    return Error{format("cannot read log %02Xh of %s: NVMe status 0x%04X", page, path, status)};
  }
  return bytes;
}

Expected<DeviceCommands::Bytes> LinuxDeviceCommands::extCsd(const std::string& path) {
  const auto device = openDevice(path, S_IFBLK);
  if (!device) return device.error();
  Bytes bytes(kExtCsdBytes);
  mmc_ioc_cmd command{};
  command.opcode = kSendExtCsd;
  command.flags = kResponseWithData;
  command.blksz = kExtCsdBytes;
  command.blocks = 1;
  command.data_ptr = addressOf(bytes);
  if (ioctl(device->get(), MMC_IOC_CMD, &command) < 0) return systemError("read EXT_CSD of", path);
  return bytes;
}

Expected<DeviceCommands::Bytes> LinuxDeviceCommands::ataSmart(const std::string& path) {
  const auto library = ataLibrary();
  if (!library) return library.error();
  const AtaLibrary& ata = **library;
  SkDisk* opened = nullptr;
  if (ata.open(path.c_str(), &opened) != 0) return systemError("open", path);
  const std::unique_ptr<SkDisk, decltype(ata.free)> disk(opened, ata.free);
  SkBool isAwake = FALSE;
  if (ata.check_sleep_mode(opened, &isAwake) == 0 && !isAwake) return Bytes{};
  if (ata.smart_read_data(opened) != 0) return systemError("read SMART data of", path);
  SkBool isGood = FALSE;
  ata.smart_status(opened, &isGood);  // becomes part of the blob
  const void* blob = nullptr;
  std::size_t size = 0;
  if (ata.get_blob(opened, &blob, &size) != 0) return systemError("keep SMART data of", path);
  const auto* const bytes = static_cast<const std::byte*>(blob);
  return Bytes(bytes, bytes + size);
}

}  // namespace tavrel::health
