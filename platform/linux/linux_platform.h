// Every service of the platform on Linux, over the files below one device root.
//
//   LinuxPlatform linux(DeviceRoot::fromEnvironment());
//   runDailyIfNeeded(linux.platform(), {});
//
// Variants of a platform copy the bundle and replace the services that differ.
//
// It owns the services, and opens and reads nothing before their first use. Its destructor commits
// the values that wait in the store, then writes changed preferences.
#pragma once

#include <memory>
#include <string>
#include <vector>

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

/// Differences from the usual platform. Everything given here must outlive the platform.
struct LinuxPlatformOptions {
  SystemLog* log = nullptr;            // instead of the journal or standard error
  FileSystem* fileSystem = nullptr;    // writes files, instead of its own
  Preferences* preferences = nullptr;  // for the other services, instead of its own
  /// A damaged store stays where it is, ECC events stay in their queue, nothing is folded: values
  /// that wait are read where they are.
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

  /// The concrete services, for operations that only the tool needs.
  FileCrashReporting& crashReporting();
  FileSystem& fileSystem();
  FilePreferences& preferences();
  SegmentFold& fold();
  FileSubmission& submission();
  RecordedRegistry& registry();
  SqliteStore& store();
  /// Which waiting values a read-only platform could not read, for people.
  const std::vector<std::string>& missingValues() const;

 private:
  struct Services;
  std::unique_ptr<Services> services_;
};

}  // namespace tavrel
