#include "platform/linux/health/reader.h"

#include <algorithm>
#include <utility>

#include "base/format.h"
#include "base/limits.h"
#include "base/text.h"
#include "platform/linux/files/boot_id.h"
#include "platform/linux/files/digests.h"
#include "platform/linux/health/ata_smart.h"
#include "platform/linux/health/flash_life.h"
#include "platform/linux/health/mtd_ubi.h"
#include "platform/linux/health/nvme_logs.h"
#include "platform/linux/health/sysfs.h"
#include "platform/persisted_state.h"
#include "platform/plist/coding.h"

namespace tavrel::health {
namespace {

// A reading waits for no other, since processes stuck in a drive would collect.
constexpr LockPatience kDrivePatience{
    0, "it is reading the drive, which is defective if that never ends"};

// Whether the kernel has all figures of a drive in memory and sends it no command.
bool isInMemory(const Drive& drive) {
  return drive.kind == DriveKind::Mtd || drive.kind == DriveKind::Ubi;
}

// Whether a reading would wake a drive that must go on sleeping. The kernel suspends cards whenever
// they are idle, so any write wakes them; figures of raw flash are in the kernel's memory.
bool isLeftAsleep(const Drive& drive) {
  switch (drive.kind) {
    case DriveKind::Nvme:
    case DriveKind::Ata:
    case DriveKind::Ufs:
      return isAsleep(drive.folder);
    case DriveKind::Emmc:
    case DriveKind::Mtd:
    case DriveKind::Ubi:
      break;
  }
  return false;
}

// Identifies a drive from one reading to the next. A digest, so that the memory file contains no
// serial number.
std::string identityOf(const Drive& drive) {
  const std::string& known = drive.serial.empty() ? drive.name : drive.serial;
  std::string identity;
  appendHex(identity,
            sha256(asBytes(format("%s\n%s\n%s", nameOf(drive.kind), drive.model, known))));
  return identity;
}

void take(Expected<Figures> figures, std::string_view from, Reading& reading) {
  if (figures) {
    reading.figures = std::move(*figures);
    reading.from = from;
  } else {
    reading.error = figures.error().message;
  }
}

// Without figures nothing is known of a drive, which is not the same as nothing wrong.
void noteAbsence(Reading& reading) {
  if (reading.figures.empty() && reading.error.empty())
    reading.error = "it reports no health figures";
}

}  // namespace

Reading readWithoutCommands(const Drive& drive) {
  Reading reading = emptyReading(drive);
  const auto attribute = [&](std::string_view name) {
    return readAttribute(format("%s/%s", drive.folder, name));
  };
  switch (drive.kind) {
    case DriveKind::Nvme:
    case DriveKind::Ata:
      reading.error = "not read yet";
      return reading;
    case DriveKind::Emmc:
      reading.from = "sysfs, as at the card's initialisation";
      reading.figures = emmcFigures(attribute("life_time"), attribute("pre_eol_info"));
      break;
    case DriveKind::Ufs:
      if (isAsleep(drive.folder)) {
        reading.error = "asleep";
        return reading;
      }
      reading.from = "health_descriptor";
      reading.figures = ufsFigures(attribute("health_descriptor/life_time_estimation_a"),
                                   attribute("health_descriptor/life_time_estimation_b"),
                                   attribute("health_descriptor/eol_info"));
      break;
    case DriveKind::Mtd:
      reading.from = "sysfs";
      reading.figures = attributeFigures(drive.folder, mtdKinds());
      break;
    case DriveKind::Ubi:
      reading.from = "sysfs";
      reading.figures = attributeFigures(drive.folder, ubiKinds());
      break;
  }
  noteAbsence(reading);
  return reading;
}

void HealthReader::readNvme(const Drive& drive, Reading& reading) {
  const auto page = commands_.nvmeLog(drive.deviceFile, kNvmeSmartLog);
  take(page ? nvmeSmartFigures(*page) : page.error(), "log 02h", reading);
  if (!page) return;
  const std::string key = drive.model + '/' + drive.firmware;
  const auto known = memory_.hasOcpLog.find(key);
  // A drive that lacks the log counts each request for it as an error.
  if (known != memory_.hasOcpLog.end() && !known->second) return;
  const auto ocpPage = commands_.nvmeLog(drive.deviceFile, kNvmeOcpLog);
  if (!ocpPage) return;  // no answer
  const auto ocp = nvmeOcpFigures(*ocpPage);
  if (known == memory_.hasOcpLog.end()) memory_.hasOcpLog[key] = static_cast<bool>(ocp);
  if (!ocp) return;
  reading.figures.insert(reading.figures.end(), ocp->begin(), ocp->end());
  appendNvmeDerived(reading.figures);
  reading.from += ", log C0h";
}

std::optional<Reading> HealthReader::readDrive(const Drive& drive) {
  if (isLeftAsleep(drive)) return std::nullopt;
  Reading reading = emptyReading(drive);
  if (drive.kind == DriveKind::Nvme) {
    readNvme(drive, reading);
  } else if (drive.kind == DriveKind::Ata) {
    const auto blob = commands_.ataSmart(drive.deviceFile);
    if (blob && blob->empty()) return std::nullopt;
    take(blob ? ataFigures(*blob) : blob.error(), "ATA SMART", reading);
  } else {
    if (drive.kind == DriveKind::Emmc) {
      const auto extCsd = commands_.extCsd(drive.deviceFile);
      take(extCsd ? emmcFigures(*extCsd) : extCsd.error(), "EXT_CSD, from the card", reading);
    }
    // Without permission to ask the card, use what the kernel has read from it.
    if (reading.from.empty()) reading = readWithoutCommands(drive);
  }
  noteAbsence(reading);
  reading.time = moment_.seconds;
  reading.boot = moment_.boot;
  if (!reading.error.empty()) {
    log_.log(LogLevel::Default, "cannot read the health of %s: %s", drive.name, reading.error);
  }
  return reading;
}

std::string HealthReader::lockPath(std::string_view name) const {
  return root_.path(format("%s/%s.lock", kReadingsFolder, name));
}

Expected<Descriptor> HealthReader::lockMemory() {
  auto lock = files_.lockFile(lockPath(""));
  if (lock) {
    refreshMemory();
  } else {
    log_.log(LogLevel::Error, "readings have no growth: %s", lock.error().message);
  }
  return lock;
}

void HealthReader::refreshMemory() {
  const std::string path = root_.path(kMemoryFile);
  const auto content = files_.readIfPresent(path, limits::kHealthMemoryBytes);
  const auto found = content ? *content : std::optional(content.error().message);
  if (found == memoryFile_) return;
  memoryFile_ = found;
  auto memory = !content   ? Expected<Memory>(content.error())
                : *content ? decodeMemory(asBytes(**content))
                           : Memory();
  if (!memory) {
    log_.log(LogLevel::Error, "cannot use remembered counters %s, starting again: %s", path,
             memory.error().message);
  }
  auto learned = std::exchange(memory_, memory ? *std::move(memory) : Memory()).hasOcpLog;
  memory_.hasOcpLog.merge(learned);
}

// Growth counts from the reading that the last daily run saw, so it restarts when the daemon's last
// run day changes.
Expected<std::optional<std::int64_t>> HealthReader::lastRunDay() {
  const std::string path =
      root_.path(format("/var/mobile/Library/Preferences/%s.plist", kTavrelDomain));
  const auto content = files_.readIfPresent(path, limits::kPreferenceFileBytes);
  if (!content) return content.error();
  std::optional<std::int64_t> day;
  if (!*content) return day;
  const auto state = plist::read(asBytes(**content));
  const auto number = state ? state->dictionary().number(kLastRunDayKey) : std::nullopt;
  if (number) day = number->int64();
  return day;
}

bool HealthReader::write(const Reading& reading) {
  const std::string path = root_.path(format("%s/%s.plist", kReadingsFolder, reading.name));
  const auto document = encodeReading(reading);
  const Status written =
      document ? files_.replace(path, asBytes(*document), 0644) : Status(document.error());
  if (!written) log_.log(LogLevel::Error, "%s", written.error().message);
  return static_cast<bool>(written);
}

bool HealthReader::keep(Memory memory) {
  const auto document = encodeMemory(memory);
  const Status kept = document ? files_.replace(root_.path(kMemoryFile), asBytes(*document), 0600)
                               : Status(document.error());
  if (!kept) {
    log_.log(LogLevel::Error, "cannot keep counters: %s", kept.error().message);
    return false;
  }
  memoryFile_ = *document;
  memory_ = std::move(memory);
  return true;
}

Expected<std::vector<Drive>> HealthReader::lookForDrives() {
  auto drives = findDrives(Machine(root_));
  if (!drives) {
    log_.log(LogLevel::Error, "cannot look for drives: %s", drives.error().message);
  }
  return drives;
}

// Looks for drives after it has listed the readings, so that a drive which has come since the run
// began keeps the reading that a later run has made.
bool HealthReader::removeGone() {
  const std::string folder = root_.path(kReadingsFolder);
  const auto names = files_.list(folder);
  if (!names) {
    log_.log(LogLevel::Error, "%s", names.error().message);
    return false;
  }
  const auto drives = lookForDrives();
  if (!drives) return false;
  for (const std::string& name : *names) {
    const bool isThere = std::ranges::any_of(
        *drives, [&](const Drive& drive) { return drive.name + ".plist" == name; });
    if (!isThere) files_.discard(folder + '/' + name);
  }
  return true;
}

std::string HealthReader::claimIdentity(const Drive& drive) {
  std::string identity = identityOf(drive);
  // Only its name tells a drive from another of the same serial number.
  if (!identities_.insert(identity).second) identity += '/' + drive.name;
  return identity;
}

bool HealthReader::isReadByLaterRun(const std::string& identity) const {
  const auto now = memory_.drives.find(identity);
  if (now == memory_.drives.end() || now->second.seen < moment_.seconds) return false;
  const auto before = atStart_.drives.find(identity);
  // A time that was there at the start is from before the clock was set back.
  return before == atStart_.drives.end() || before->second.seen != now->second.seen;
}

bool HealthReader::store(std::span<Taken> taken, bool isMemoryLocked) {
  Memory advanced = memory_;
  bool hasGrowth = false;
  for (auto& [identity, reading] : taken) {
    if (!reading.error.empty() || !hasRunDay_ || !isMemoryLocked) continue;
    reading.growth = takeGrowth(advanced.drives[identity], reading.figures, moment_);
    hasGrowth = true;
  }
  // Store the memory before anybody sees the growth, or the next run would count it again: the
  // next drive may never answer.
  const bool isKept = isMemoryLocked && (!hasGrowth || keep(std::move(advanced)));
  bool isDone = isKept;
  for (auto& [identity, reading] : taken) {
    if (!isKept) reading.growth.clear();
    isDone = write(reading) && isDone;
  }
  return isDone;
}

// Under one lock, so that no other run stores later figures in between.
bool HealthReader::readInMemory(std::span<const Drive> drives) {
  if (drives.empty()) return true;
  const auto lock = lockMemory();
  std::vector<Taken> taken;
  for (const Drive& drive : drives) {
    std::string identity = claimIdentity(drive);
    if (isReadByLaterRun(identity)) continue;
    if (auto reading = readDrive(drive))
      taken.emplace_back(std::move(identity), *std::move(reading));
  }
  return store(taken, static_cast<bool>(lock));
}

// Locks the memory only after the drive has answered, since others wait for the memory.
bool HealthReader::readWithCommands(const Drive& drive) {
  std::string identity = claimIdentity(drive);
  // A process that waits for a drive which never answers cannot even be killed.
  const auto driveLock = files_.lockFile(lockPath('.' + drive.name), kDrivePatience);
  if (!driveLock) {
    log_.log(LogLevel::Error, "cannot read the health of %s: %s", drive.name,
             driveLock.error().message);
    return false;
  }
  refreshMemory();
  if (isReadByLaterRun(identity)) return true;
  auto reading = readDrive(drive);
  if (!reading) return true;
  const auto lock = lockMemory();
  Taken taken(std::move(identity), *std::move(reading));
  return store({&taken, 1}, static_cast<bool>(lock));
}

bool HealthReader::readAll(std::int64_t nowSeconds) {
  auto drives = lookForDrives();
  if (!drives) return false;
  const auto runDay = lastRunDay();
  if (!runDay) {
    log_.log(LogLevel::Error, "readings have no growth: %s", runDay.error().message);
  }
  hasRunDay_ = static_cast<bool>(runDay);
  moment_ = {nowSeconds, bootIDOf(root_), runDay ? *runDay : std::nullopt};
  bool isDone = hasRunDay_;
  refreshMemory();
  atStart_ = memory_;
  // Without commands first, and together: each writing of the memory costs flushes of the flash.
  const auto others = std::stable_partition(drives->begin(), drives->end(), isInMemory);
  isDone = readInMemory({drives->begin(), others}) && isDone;
  for (const Drive& drive : std::span(others, drives->end()))
    isDone = readWithCommands(drive) && isDone;
  // Last, because a drive that was just read is not old, whatever the clock showed before.
  if (memory_.forgetOld(moment_.seconds)) {
    const auto lock = lockMemory();
    memory_.forgetOld(moment_.seconds);
    isDone = lock && keep(memory_) && isDone;
  }
  return removeGone() && isDone;
}

}  // namespace tavrel::health
