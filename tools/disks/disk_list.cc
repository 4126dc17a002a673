#include "tools/disks/disk_list.h"

#include <algorithm>

#include "base/arithmetic.h"
#include "platform/linux/files/boot_id.h"
#include "platform/linux/health/drives.h"
#include "platform/linux/health/reader.h"
#include "platform/linux/linux_platform.h"

namespace tavrel {

using namespace health;

DiskList findDisks(ToolContext& context) {
  auto [readings, faults] = loadReadings(context.root(), context.linuxPlatform().fileSystem());
  const std::int64_t now = saturatingInt64(context.platform().clock->now().secondsSince1970());
  const std::string boot = bootIDOf(context.root());
  const auto drives = findDrives(Machine(context.root()));
  if (!drives) faults.push_back(drives.error());
  for (const Drive& drive : drives ? *drives : std::vector<Drive>()) {
    const bool isRead = std::ranges::any_of(
        readings, [&](const Reading& reading) { return reading.name == drive.name; });
    if (isRead) continue;
    readings.push_back(readWithoutCommands(drive));
    readings.back().time = now;
  }
  std::ranges::stable_sort(readings, {}, &Reading::kind);
  DiskList list{{}, std::move(faults)};
  for (Reading& reading : readings) {
    Verdict verdict = judge(reading, now, boot);
    const std::int64_t age = std::max<std::int64_t>(now - reading.time, 0);
    list.disks.push_back({std::move(reading), std::move(verdict), age});
  }
  return list;
}

}  // namespace tavrel
