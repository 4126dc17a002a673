#include "platform/linux/health/drives.h"

#include <limits>
#include <set>

#include "platform/linux/health/sysfs.h"

namespace tavrel::health {
namespace {

constexpr std::int64_t kSector = 512;

std::optional<std::int64_t> bytesOfSectors(std::optional<std::int64_t> sectors) {
  if (!sectors || *sectors > std::numeric_limits<std::int64_t>::max() / kSector) {
    return std::nullopt;
  }
  return *sectors * kSector;
}

// The namespaces of a controller are "nvme0n1" below it, or "nvme0c0n1" with several paths.
std::optional<std::int64_t> nvmeCapacity(const std::string& folder, const std::string& name) {
  std::optional<std::int64_t> total;
  const auto entries = namesIn(folder);
  if (!entries) return total;
  for (const std::string& entry : *entries) {
    if (!entry.starts_with(name)) continue;
    const auto bytes = bytesOfSectors(readNumber(folder + '/' + entry + "/size"));
    std::int64_t sum = 0;
    if (bytes && !__builtin_add_overflow(total.value_or(0), *bytes, &sum)) total = sum;
  }
  return total;
}

Status addNvme(const Machine& machine, std::vector<Drive>& drives) {
  const std::string classFolder = machine.sys + "/class/nvme/";
  const auto names = namesIn(classFolder);
  if (!names) return names.error();
  for (const std::string& name : *names) {
    const std::string folder = classFolder + name;
    if (!isNumbered(name, "nvme")) continue;
    drives.push_back({name, DriveKind::Nvme, folder, machine.dev + '/' + name,
                      readLabel(folder + "/model"), readLabel(folder + "/firmware_rev"),
                      readLabel(folder + "/serial"), nvmeCapacity(folder, name)});
  }
  return Done{};
}

Status addEmmc(const Machine& machine, std::vector<Drive>& drives) {
  const auto names = namesIn(machine.sys + "/block");
  if (!names) return names.error();
  for (const std::string& name : *names) {
    const std::string block = machine.sys + "/block/" + name;
    const std::string folder = block + "/device";
    if (!isNumbered(name, "mmcblk")) continue;
    const auto type = readKind(folder + "/type");
    if (!type) return type.error();
    if (*type != "MMC") continue;
    drives.push_back({name, DriveKind::Emmc, folder, machine.dev + '/' + name,
                      readLabel(folder + "/name"), readLabel(folder + "/fwrev"),
                      readLabel(folder + "/serial"), bytesOfSectors(readNumber(block + "/size"))});
  }
  return Done{};
}

// A UFS device shows logical units as SCSI disks; its health is in a folder of the controller.
std::string ufsController(const std::string& device) {
  std::string folder = resolved(device);
  while (!folder.empty() && !folder.ends_with("/devices")) {
    if (!resolved(folder + "/health_descriptor").empty()) return folder;
    folder.resize(folder.find_last_of('/'));
  }
  return {};
}

Status addScsi(const Machine& machine, std::vector<Drive>& drives) {
  std::vector<Drive> ata;
  std::set<std::string> controllers;
  const auto names = namesIn(machine.sys + "/block");
  if (!names) return names.error();
  for (const std::string& name : *names) {
    if (!name.starts_with("sd")) continue;
    const std::string block = machine.sys + "/block/" + name;
    const std::string device = block + "/device";
    const std::string model = readLabel(device + "/model");
    const std::string firmware = readLabel(device + "/rev");
    const auto capacity = bytesOfSectors(readNumber(block + "/size"));
    const auto vendor = readKind(device + "/vendor");
    if (!vendor) return vendor.error();
    if (*vendor == "ATA") {
      // The identity page has a header of four bytes before the serial number.
      const std::string page = readLabel(device + "/vpd_pg80");
      const std::string serial = page.size() > 4 ? page.substr(4) : std::string();
      ata.push_back({name, DriveKind::Ata, device, machine.dev + '/' + name, model, firmware,
                     serial, capacity});
      continue;
    }
    const std::string controller = ufsController(device);
    if (controller.empty() || !controllers.insert(controller).second) continue;
    drives.push_back({"ufs" + std::to_string(controllers.size() - 1),
                      DriveKind::Ufs,
                      controller,
                      {},
                      model,
                      firmware,
                      {},
                      {}});
  }
  drives.insert(drives.end(), ata.begin(), ata.end());
  return Done{};
}

Status addRawFlash(const Machine& machine, std::vector<Drive>& drives) {
  const auto partitions = namesIn(machine.sys + "/class/mtd");
  if (!partitions) return partitions.error();
  for (const std::string& name : *partitions) {
    const std::string folder = machine.sys + "/class/mtd/" + name;
    if (!isNumbered(name, "mtd")) continue;
    drives.push_back({name,
                      DriveKind::Mtd,
                      folder,
                      {},
                      readLabel(folder + "/name"),
                      {},
                      {},
                      readNumber(folder + "/size")});
  }
  const auto volumes = namesIn(machine.sys + "/class/ubi");
  if (!volumes) return volumes.error();
  for (const std::string& name : *volumes) {
    const std::string folder = machine.sys + "/class/ubi/" + name;
    if (!isNumbered(name, "ubi")) continue;
    const auto blocks = readNumber(folder + "/total_eraseblocks");
    const auto size = readNumber(folder + "/eraseblock_size");
    const auto device = readNumber(folder + "/mtd_num");
    std::int64_t bytes = 0;
    const bool isKnown = blocks && size && !__builtin_mul_overflow(*blocks, *size, &bytes);
    drives.push_back({name,
                      DriveKind::Ubi,
                      folder,
                      {},
                      device ? "mtd" + std::to_string(*device) : "mtd",
                      {},
                      {},
                      isKnown ? std::optional(bytes) : std::nullopt});
  }
  return Done{};
}

}  // namespace

Machine::Machine(const DeviceRoot& root) {
  const std::string below = root.path("/sys");
  const bool isRecorded = !resolved(below).empty();
  sys = isRecorded ? below : "/sys";
  dev = isRecorded ? root.path("/dev") : "/dev";
}

Expected<std::vector<Drive>> findDrives(const Machine& machine) {
  std::vector<Drive> drives;
  for (const auto add : {addNvme, addEmmc, addScsi, addRawFlash}) {
    if (Status done = add(machine, drives); !done) return done.error();
  }
  return drives;
}

}  // namespace tavrel::health
