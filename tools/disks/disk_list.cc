#include "tools/disks/disk_list.h"

#include <algorithm>
#include <set>
#include <string>

#include "base/instant.h"
#include "platform/linux/files/boot_id.h"
#include "platform/linux/health/drives.h"
#include "platform/linux/health/reader.h"
#include "platform/linux/linux_platform.h"

namespace tavrel {

using namespace health;

DiskList findDisks(ToolContext& context) {
  auto [readings, faults] = loadReadings(context.root(), context.linuxPlatform().fileSystem());
  const std::int64_t now = wholeSeconds(context.platform().clock->now());
  const std::string boot = bootIDOf(context.root());
  const auto drives = findDrives(Machine(context.root()));
  if (!drives) faults.push_back(drives.error());
  std::set<std::string> unread;
  for (const Drive& drive : drives ? *drives : std::vector<Drive>()) {
    const bool isRead = std::ranges::any_of(
        readings, [&](const Reading& reading) { return reading.name == drive.name; });
    if (isRead) continue;
    readings.push_back(readWithoutCommands(drive));
    readings.back().time = now;
    if (!readings.back().error.empty()) unread.insert(drive.name);
  }
  std::ranges::stable_sort(readings, {}, &Reading::kind);
  DiskList list{{}, std::move(faults)};
  for (Reading& reading : readings) {
    Verdict verdict = judge(reading, now, boot);
    const bool isUnread = unread.contains(reading.name);
    const std::int64_t age = std::max<std::int64_t>(now - reading.time, 0);
    list.disks.push_back(
        {std::move(reading), std::move(verdict), isUnread ? std::nullopt : std::optional(age)});
  }
  return list;
}

std::optional<Wear> wearOf(const Disk& disk) {
  std::optional<Wear> wear;
  for (const std::string_view name : {"used_pct", "life_a_pct", "life_b_pct"}) {
    const std::int64_t* const percent = valueOf(disk.reading.figures, name);
    if (percent && (!wear || *percent > wear->percent)) wear = Wear{name, *percent};
  }
  return wear;
}

}  // namespace tavrel
