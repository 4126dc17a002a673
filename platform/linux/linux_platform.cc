#include "platform/linux/linux_platform.h"

#include <utility>

#include "base/limits.h"
#include "platform/linux/device/file_device_answers.h"
#include "platform/linux/device/linux_applications.h"
#include "platform/linux/device/linux_dynamic_loader.h"
#include "platform/linux/device/linux_system_controls.h"
#include "platform/linux/device/linux_system_version.h"
#include "platform/linux/files/device_file_reader.h"
#include "platform/linux/files/digests.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/folding/folding_store.h"
#include "platform/linux/folding/segment_fold.h"
#include "platform/linux/folding/unfolded_store.h"
#include "platform/linux/live/live_machine.h"
#include "platform/linux/locale/linux_date_formatting.h"
#include "platform/linux/locale/linux_locale.h"
#include "platform/linux/logs/file_crash_reporting.h"
#include "platform/linux/logs/file_submission.h"
#include "platform/linux/logs/guarded_preferences.h"
#include "platform/linux/preferences/file_preferences.h"
#include "platform/linux/process/linux_clock.h"
#include "platform/linux/process/linux_event_loop.h"
#include "platform/linux/process/linux_process.h"
#include "platform/linux/recorded/recorded_registry.h"
#include "platform/linux/recorded/recorded_snapshots.h"
#include "platform/linux/service/file_notifications.h"
#include "platform/linux/service/socket_service.h"
#include "platform/linux/store/sqlite_store.h"
#include "platform/linux/system_log/linux_standard_streams.h"
#include "platform/linux/system_log/linux_system_log.h"
#include "platform/plist/coding.h"

namespace tavrel {

// Members are destroyed from the last to the first: the store commits while preferences can still
// be set, and preferences are written while the log can still report a failure.
struct LinuxPlatform::Services {
  Services(DeviceRoot folder, const LinuxPlatformOptions& given)
      : options(given), root(std::move(folder)) {}

  const LinuxPlatformOptions options;
  const DeviceRoot root;
  LinuxSystemLog systemLog;
  SystemLog& log = options.log != nullptr ? *options.log : systemLog;
  LinuxClock clock;
  FileSystem ownFileSystem;
  FileSystem& fileSystem = options.fileSystem != nullptr ? *options.fileSystem : ownFileSystem;
  plist::PlistCoding propertyLists;
  DeviceFileReader files{root, fileSystem};
  LinuxDigest digest;
  LinuxSystemVersion systemVersion{root, fileSystem, propertyLists, log};
  FileDeviceAnswers answers{root, fileSystem, propertyLists, log};
  FilePreferences filePreferences{root, fileSystem, propertyLists, clock, log};
  Preferences& preferences =
      options.preferences != nullptr ? *options.preferences : filePreferences;
  GuardedPreferences guardedPreferences{preferences, log};
  SqliteStore store{
      root, clock, preferences, log, limits::kStoreBusyMilliseconds, options.readOnly};
  SegmentFold fold{root, store, fileSystem, propertyLists, log};
  FoldingStore foldingStore{store, fold, log};
  UnfoldedStore unfoldedStore{root, store, fileSystem, propertyLists, log};
  DayNotingStore statistics{options.readOnly ? static_cast<StatisticsStore&>(unfoldedStore)
                                             : foldingStore};
  FileSubmission submission{root,
                            {.files = fileSystem,
                             .propertyLists = propertyLists,
                             .preferences = preferences,
                             .filePreferences = filePreferences,
                             .reportedDays = statistics,
                             .systemVersion = systemVersion,
                             .clock = clock,
                             .log = log},
                            options.readOnly};
  EccEvents eccEvents{root, fileSystem, propertyLists, log,
                      options.readOnly ? EccEvents::Mode::Peek : EccEvents::Mode::Consume};
  FileCrashReporting crashReporting{root, fileSystem, systemVersion, eccEvents, clock, log};
  LinuxApplications applications{root, log};
  LinuxLocale locale{root, log};
  LinuxSystemControls systemControls{root, fileSystem, propertyLists, log, eccEvents};
  LinuxDynamicLoader dynamicLoader{root, fileSystem, propertyLists, log, preferences};
  FileNotifications notifications{root, log};
  LinuxEventLoop eventLoop;
  SocketServices namedServices{eventLoop, root, log};
  LinuxDateFormatting dateFormatting{root};
  LinuxProcess process;
  LinuxStandardStreams standardStreams{systemLog};
  LiveMachine live{root, log};
  RecordedRegistry drivers{root, fileSystem, propertyLists, log, &live};
  RecordedSnapshots stackSnapshots{root, fileSystem, log};
  ProcessState state;

  Platform platform{
      .applications = applications,
      .clock = clock,
      .crashReporting = crashReporting,
      .dateFormatting = dateFormatting,
      .deviceAnswers = answers,
      .digest = digest,
      .drivers = drivers,
      .dynamicLoader = dynamicLoader,
      .eventLoop = eventLoop,
      .files = files,
      .locale = locale,
      .log = log,
      .namedServices = namedServices,
      .notifications = notifications,
      .preferences = guardedPreferences,
      .process = process,
      .propertyLists = propertyLists,
      .stackSnapshots = stackSnapshots,
      .standardStreams = standardStreams,
      .statistics = statistics,
      .submission = submission,
      .systemControls = systemControls,
      .systemVersion = systemVersion,
      .state = state,
  };
};

LinuxPlatform::LinuxPlatform(DeviceRoot root, const LinuxPlatformOptions& options)
    : services_(std::make_unique<Services>(std::move(root), options)) {}
LinuxPlatform::~LinuxPlatform() = default;

Platform& LinuxPlatform::platform() {
  return services_->platform;
}
const DeviceRoot& LinuxPlatform::root() const {
  return services_->root;
}
FileCrashReporting& LinuxPlatform::crashReporting() {
  return services_->crashReporting;
}
FileSystem& LinuxPlatform::fileSystem() {
  return services_->fileSystem;
}
FilePreferences& LinuxPlatform::preferences() {
  return services_->filePreferences;
}
FileSubmission& LinuxPlatform::submission() {
  return services_->submission;
}
SegmentFold& LinuxPlatform::fold() {
  return services_->fold;
}
const std::vector<std::string>& LinuxPlatform::missingValues() const {
  return services_->unfoldedStore.missing();
}
RecordedRegistry& LinuxPlatform::registry() {
  return services_->drivers;
}
SqliteStore& LinuxPlatform::store() {
  return services_->store;
}

}  // namespace tavrel
