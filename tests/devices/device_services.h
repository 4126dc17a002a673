// A device root with the services that most others are built on.
#pragma once

#include <fcntl.h>
#include <sys/stat.h>

#include "base/format.h"
#include "base/limits.h"
#include "base/text.h"
#include "platform/linux/preferences/file_preferences.h"
#include "platform/plist/coding.h"
#include "tests/devices/temporary_root.h"

namespace tavrel {

/// Stands still at 2026-11-27 18:02:18.25 UTC until it is set.
class FixedClock final : public Clock {
 public:
  plist::Date now() override { return time; }
  std::uint64_t ticks() override { return 0; }
  std::optional<TimeBase> timeBase() override { return TimeBase{1, 1}; }

  plist::Date time = plist::Date::since1970(1'795'802'538.25);
};

/// Skips flushing, which only costs time where no power can fail.
class QuickFileSystem final : public FileSystem {
 protected:
  int syncFile(int) override { return 0; }
};

/// The services of one process on a device.
struct ProcessServices {
  explicit ProcessServices(const DeviceRoot& root, FileSystem* otherFiles = nullptr)
      : fileSystem(otherFiles ? *otherFiles : files),
        preferences(root, fileSystem, coding, clock, log) {}

  KeptLog log;
  QuickFileSystem files;
  FileSystem& fileSystem;
  FixedClock clock;
  plist::PlistCoding coding;
  FilePreferences preferences;
};

struct DeviceServices : TemporaryRoot, ProcessServices {
  DeviceServices() : ProcessServices(root) {}
};

}  // namespace tavrel
