// Sources that count files or make system calls: the boot, and the mounted file systems.
#include <algorithm>
#include <linux/magic.h>
#include <string>
#include <sys/stat.h>
#include <sys/statfs.h>
#include <sys/statvfs.h>
#include <unordered_set>

#include "base/ascii.h"
#include "base/format.h"
#include "base/limits.h"
#include "platform/linux/files/folder_walk.h"
#include "platform/linux/live/sources.h"
#include "platform/linux/live/text_table.h"

namespace tavrel::live {
namespace {

constexpr Figure kUptime[] = {{"", 0, "boot.seconds", kSeconds, {}, kItself}};

bool isMountPoint(const std::string& folder, const std::string& parent) {
  struct stat inner {};
  struct stat outer {};
  return stat(folder.c_str(), &inner) == 0 && stat(parent.c_str(), &outer) == 0 &&
         inner.st_dev != outer.st_dev;
}

// Records that the kernel left when it crashed. A folder that is not mounted looks empty, too.
std::int64_t crashRecords(const std::string& folder, const std::string& parent) {
  std::int64_t count = 0;
  const int code = walkFolder(folder, [&count](const dirent& entry) {
    count += std::string_view(entry.d_name).starts_with("dmesg-") ? 1 : 0;
    return true;
  });
  if (code != 0) return kUnset;
  return count > 0 || isMountPoint(folder, parent) ? count : kUnset;
}

// The list of mounts escapes characters in octal: "\040" is a blank.
std::string unescaped(std::string_view text) {
  std::string path;
  const auto isOctal = [](char c) { return c >= '0' && c <= '7'; };
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (text[i] == '\\' && text.size() - i > 3 && isOctal(text[i + 1]) && isOctal(text[i + 2]) &&
        isOctal(text[i + 3])) {
      path += static_cast<char>((text[i + 1] - '0') << 6 | (text[i + 2] - '0') << 3 |
                                (text[i + 3] - '0'));
      i += 3;
    } else {
      path += text[i];
    }
  }
  return path;
}

// Only file systems on this machine's disks: others may keep the reader waiting.
bool isLocal(std::string_view device, std::string_view type) {
  return (device.starts_with("/dev/") || device.starts_with("ubi")) && !type.starts_with("fuse");
}

enum FileSystemSlot : std::size_t { kSize, kUsed, kAvailable, kUsedPercent, kFiles, kFilesFree };
constexpr std::uint32_t kFileSystemSlots = 6;

std::int64_t inBytes(std::uint64_t blocks, std::uint64_t size) {
  std::int64_t bytes = 0;
  return __builtin_mul_overflow(blocks, size, &bytes) ? INT64_MAX : bytes;
}

void measureFileSystem(const std::string& mountPoint, std::span<std::int64_t> slots) {
  struct statvfs status {};
  if (statvfs(mountPoint.c_str(), &status) != 0 || status.f_blocks == 0) return;
  slots[kSize] = inBytes(status.f_blocks, status.f_frsize);
  // A file system that claims to have more free than there is says nothing about its use.
  if (std::max(status.f_bfree, status.f_bavail) <= status.f_blocks) {
    slots[kUsed] = inBytes(status.f_blocks - status.f_bfree, status.f_frsize);
    slots[kAvailable] = inBytes(status.f_bavail, status.f_frsize);
    const double used = static_cast<double>(slots[kUsed]);
    const double usable = used + static_cast<double>(slots[kAvailable]);
    if (usable > 0) slots[kUsedPercent] = static_cast<std::int64_t>(100 * used / usable);
  }
  // Some file systems allocate inodes on demand and have no total.
  if (status.f_files == 0) return;
  slots[kFiles] = inBytes(status.f_files, 1);
  slots[kFilesFree] = inBytes(status.f_ffree, 1);
}

}  // namespace

void addBoot(const DeviceRoot& root, LiveSource& source) {
  addFigures(root.path("/proc/uptime"),
             {.group = "Boot", .figures = kUptime, .form = {.key = TableForm::kNoKey}}, source);
  const std::string folder = root.path("/sys/fs/pstore");
  const std::string parent = root.path("/sys/fs");
  if (crashRecords(folder, parent) == kUnset) return;
  const std::uint32_t slot = source.addMeasured(1, [folder, parent](std::span<std::int64_t> slots) {
    slots[0] = crashRecords(folder, parent);
  });
  source.addSimple({"Boot", "", kEvents}, "boot.crash_records", slot, kDailyCategory);
}

// Sizes come from the mounted file systems themselves, so a copied list of mounts is useless.
void addFileSystems(const DeviceRoot& root, LiveSource& source) {
  struct statfs status {};
  if (statfs(root.path("/proc").c_str(), &status) != 0) return;
  if (status.f_type != PROC_SUPER_MAGIC) return;
  TextBuffer buffer;
  auto text = readKernelFile(root.path("/proc/self/mounts"), ReadMode::ToEnd, buffer);
  std::unordered_set<std::string> seen;
  bool isCut = buffer.isCut();
  while (text && !text->empty()) {
    std::string_view line = takeLine(*text);
    const auto takeField = [&] {
      const std::string_view field = line.substr(0, line.find(' '));
      line.remove_prefix(std::min(line.size(), field.size() + 1));
      return field;
    };
    const std::string device = unescaped(takeField());
    const std::string mountPoint = unescaped(takeField());
    const bool isRoot = mountPoint == "/";
    const bool isOnDisk = isLocal(device, takeField());
    if (!isRoot && !isOnDisk) continue;
    if (seen.contains(device)) continue;
    isCut = isCut || seen.size() == limits::kLiveDevices;
    if (seen.size() == limits::kLiveDevices) break;
    seen.insert(device);
    const std::string name = isOnDisk ? channelName(device.substr(device.rfind('/') + 1)) : "root";
    const std::uint32_t first = source.addMeasured(
        kFileSystemSlots,
        [mountPoint](std::span<std::int64_t> slots) { measureFileSystem(mountPoint, slots); });
    const auto add = [&](const char* figure, Unit unit, FileSystemSlot slot) {
      source.addSimple({"File Systems", name, unit}, name + figure,
                       first + static_cast<std::uint32_t>(slot));
    };
    add(".fs_size", kBytes, kSize);
    add(".fs_used", kBytes, kUsed);
    add(".fs_available", kBytes, kAvailable);
    add(".fs_used_percent", kPlain, kUsedPercent);
    add(".fs_files", kPlain, kFiles);
    add(".fs_files_free", kPlain, kFilesFree);
    if (isRoot) {
      source.addToFold("fs.root_used_percent", kPlain, LiveSource::Fold::Largest,
                       first + static_cast<std::uint32_t>(kUsedPercent));
    }
  }
  if (isCut) {
    source.note(format("only the first %zu mounted file systems are shown", seen.size()));
  }
}

}  // namespace tavrel::live
