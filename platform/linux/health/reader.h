// Reads all drives of the machine and stores their readings where everybody can read them.
#pragma once

#include <optional>
#include <set>
#include <span>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/health/device_commands.h"
#include "platform/linux/health/drives.h"
#include "platform/linux/health/growth.h"
#include "platform/linux/health/reading.h"
#include "platform/system_log.h"

namespace tavrel::health {

/// Remembered counters, and which drives have the OCP log. Only root may read it.
inline constexpr std::string_view kMemoryFile = "/var/lib/tavrel/health/memory.plist";

/// Figures that need no command to the drive, for the kinds of drive that have such figures. Sets
/// the reading's error when the drive is asleep or shows nothing.
Reading readWithoutCommands(const Drive& drive);

class HealthReader {
 public:
  /// All must outlive the reader.
  HealthReader(const DeviceRoot& root, FileSystem& files, DeviceCommands& commands, SystemLog& log)
      : root_(root), files_(files), commands_(commands), log_(log) {}

  /// False when drives could not be listed, or a reading or the memory could not be written. A
  /// sleeping drive keeps its earlier reading, the reading of a drive that has gone is removed, and
  /// the reading of a drive that cannot be read says why. A drive that another process is reading
  /// keeps its earlier reading, too; the answer is then false.
  bool readAll(std::int64_t nowSeconds);

 private:
  std::string lockPath(std::string_view name) const;
  /// Makes `memory_` what is stored now.
  void refreshMemory();
  /// The same, and keeps other runs from changing it.
  Expected<Descriptor> lockMemory();
  Expected<std::optional<std::int64_t>> lastRunDay();
  /// What the memory calls a drive. To be called once for each drive of a run.
  std::string claimIdentity(const Drive& drive);
  /// Whether a run that began later has stored a reading of the drive, while this one waited.
  bool isReadByLaterRun(const std::string& identity) const;
  bool readInMemory(std::span<const Drive> drives);
  bool readWithCommands(const Drive& drive);
  /// Nothing when the drive sleeps.
  std::optional<Reading> readDrive(const Drive& drive);
  void readNvme(const Drive& drive, Reading& reading);
  using Taken = std::pair<std::string, Reading>;  // with the identity of the drive
  /// Stores once what is remembered of drives, then their readings.
  bool store(std::span<Taken> taken, bool isMemoryLocked);
  bool write(const Reading& reading);
  /// Stores what is to be remembered. `memory_` stays as it was when that fails, so that the growth
  /// that no reading shows counts again.
  bool keep(Memory memory);
  Expected<std::vector<Drive>> lookForDrives();
  bool removeGone();

  const DeviceRoot& root_;
  FileSystem& files_;
  DeviceCommands& commands_;
  SystemLog& log_;
  Moment moment_;
  bool hasRunDay_ = false;
  Memory memory_;
  std::optional<std::string> memoryFile_;  // when last read or written; or why it is unreadable
  Memory atStart_;                         // the memory when the run began
  std::set<std::string> identities_;       // of the drives looked at
};

}  // namespace tavrel::health
