// Every service of the platform on Linux, over the files below one device root.
//
//   LinuxPlatform linux(DeviceRoot::fromEnvironment());
//   runDailyIfNeeded(linux.platform(), {});
//
// It owns the services. Nothing is opened or read before it is asked for. On destruction the values
// that the store holds back are committed, then preferences that were changed are written.
#pragma once

#include <memory>

#include "platform/linux/device_root.h"
#include "platform/platform.h"

namespace tavrel {

class FileLayer;
class FilePreferences;
class FileSubmission;
class SqliteStore;

class LinuxPlatform {
 public:
  explicit LinuxPlatform(DeviceRoot root);
  ~LinuxPlatform();
  LinuxPlatform(const LinuxPlatform&) = delete;
  LinuxPlatform& operator=(const LinuxPlatform&) = delete;

  Platform& platform();
  const DeviceRoot& root() const;

  /// The concrete services, for operations that only the tool has.
  FileLayer& fileLayer();
  FilePreferences& preferences();
  FileSubmission& submission();
  SqliteStore& store();

 private:
  struct Services;
  std::unique_ptr<Services> services_;
};

}  // namespace tavrel
