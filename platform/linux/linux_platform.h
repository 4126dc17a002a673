// Every service of the platform on Linux, over the files below one device root.
//
//   LinuxPlatform linux(DeviceRoot::fromEnvironment());
//   runDailyIfNeeded(linux.platform(), {});
//
// Variants of a platform copy the bundle and replace the services that differ.
//
// It owns the services. It opens and reads nothing before the first use. Destruction commits the
// values that the store holds back, then writes changed preferences.
#pragma once

#include <memory>

#include "platform/linux/files/device_root.h"
#include "platform/platform.h"

namespace tavrel {

class FileCrashReporting;
class FilePreferences;
class FileSubmission;
class FileSystem;
class RecordedRegistry;
class SegmentFold;
class SqliteStore;

/// How one Linux platform may differ from another. Everything given here must outlive it.
struct LinuxPlatformOptions {
  SystemLog* log = nullptr;            // in place of the journal or standard error
  FileSystem* fileSystem = nullptr;    // what writes files, in place of its own
  Preferences* preferences = nullptr;  // what the other services read, in place of its own
  /// A damaged store stays where it is, ECC events stay in their queue, nothing is folded.
  bool readOnly = false;
};

class LinuxPlatform {
 public:
  explicit LinuxPlatform(DeviceRoot root, const LinuxPlatformOptions& options = {});
  ~LinuxPlatform();
  LinuxPlatform(const LinuxPlatform&) = delete;
  LinuxPlatform& operator=(const LinuxPlatform&) = delete;

  Platform& platform();
  const DeviceRoot& root() const;

  /// The concrete services, for operations that only the tool has.
  FileCrashReporting& crashReporting();
  FileSystem& fileSystem();
  FilePreferences& preferences();
  SegmentFold& fold();
  FileSubmission& submission();
  RecordedRegistry& registry();
  SqliteStore& store();

 private:
  struct Services;
  std::unique_ptr<Services> services_;
};

}  // namespace tavrel
