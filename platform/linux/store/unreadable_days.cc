#include "platform/linux/store/unreadable_days.h"

#include <sstream>
#include <time.h>

#include "base/bytes.h"
#include "base/format.h"
#include "base/limits.h"
#include "platform/linux/files/boot_id.h"
#include "platform/linux/files/file_system.h"

namespace tavrel {

// The note is one line: device, inode, days, the last of them, and when that was noted, in seconds
// since a boot, with its ID.
std::int64_t countUnreadableDay(const std::string& note, const FileIdentity& store,
                                std::int64_t day) {
  constexpr std::int64_t kSecondsBetween = 43'200;
  FileSystem files;
  FileIdentity noted;
  std::int64_t days = 0, lastDay = 0, lastSeconds = 0;
  std::string lastBoot;
  if (const auto text = files.readIfPresent(note, limits::kSystemFactBytes); text && *text) {
    std::istringstream line(**text);
    line >> noted.device >> noted.inode >> days >> lastDay >> lastSeconds >> lastBoot;
  }
  if (noted != store || day < lastDay) days = 0;
  timespec now{};
  clock_gettime(CLOCK_BOOTTIME, &now);
  const std::string boot = bootIDOf(DeviceRoot("/"));
  const bool isSoon = boot == lastBoot && now.tv_sec - lastSeconds < kSecondsBetween;
  if (days > 0 && (day == lastDay || isSoon)) return days;
  const std::string line = format("%llu %llu %lld %lld %lld %s\n", store.device, store.inode,
                                  days + 1, day, std::int64_t{now.tv_sec}, boot);
  return files.replace(note, asBytes(line), 0640) ? days + 1 : days;
}

}  // namespace tavrel
