#include "platform/linux/linux_platform.h"

#include <utility>

#include "platform/linux/digests.h"
#include "platform/linux/file_crash_reporting.h"
#include "platform/linux/file_device_answers.h"
#include "platform/linux/file_layer.h"
#include "platform/linux/file_notifications.h"
#include "platform/linux/file_preferences.h"
#include "platform/linux/file_submission.h"
#include "platform/linux/linux_applications.h"
#include "platform/linux/linux_clock.h"
#include "platform/linux/linux_date_formatting.h"
#include "platform/linux/linux_dynamic_loader.h"
#include "platform/linux/linux_event_loop.h"
#include "platform/linux/linux_files.h"
#include "platform/linux/linux_locale.h"
#include "platform/linux/linux_process.h"
#include "platform/linux/linux_standard_streams.h"
#include "platform/linux/linux_system_controls.h"
#include "platform/linux/linux_system_log.h"
#include "platform/linux/linux_system_version.h"
#include "platform/linux/recorded_registry.h"
#include "platform/linux/recorded_snapshots.h"
#include "platform/linux/socket_service.h"
#include "platform/linux/sqlite_store.h"
#include "platform/plist/coding.h"

namespace tavrel {

// Members are destroyed from the last to the first: the store commits while preferences can still
// be set, preferences are written while the log can still tell a failure.
struct LinuxPlatform::Services {
  explicit Services(DeviceRoot folder) : root(std::move(folder)) {}

  const DeviceRoot root;
  LinuxSystemLog log;
  LinuxClock clock;
  FileLayer layer;
  plist::PlistCoding propertyLists;
  LinuxFiles files{root, layer};
  LinuxDigest digest;
  LinuxSystemVersion systemVersion{root, layer, propertyLists, log};
  FileDeviceAnswers answers{root, layer, propertyLists, log};
  FilePreferences preferences{root, layer, propertyLists, clock, log};
  SqliteStore store{root, clock, preferences, log};
  FileSubmission submission{root, layer, propertyLists, preferences, systemVersion, clock, log};
  FileCrashReporting crashReporting{root, layer, systemVersion, clock, log};
  LinuxApplications applications{root, log};
  LinuxLocale locale{root, log};
  LinuxSystemControls systemControls{root, layer, propertyLists, log};
  LinuxDynamicLoader dynamicLoader{root, layer, propertyLists, log, preferences};
  FileNotifications notifications{root, log};
  LinuxEventLoop eventLoop;
  SocketServices namedServices{eventLoop, root, log};
  LinuxDateFormatting dateFormatting{root};
  LinuxProcess process;
  LinuxStandardStreams standardStreams;
  RecordedRegistry drivers{root, layer, propertyLists, log};
  RecordedSnapshots stackSnapshots{root, layer, log};
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
      .preferences = preferences,
      .process = process,
      .propertyLists = propertyLists,
      .stackSnapshots = stackSnapshots,
      .standardStreams = standardStreams,
      .statistics = store,
      .submission = submission,
      .systemControls = systemControls,
      .systemVersion = systemVersion,
      .state = state,
  };
};

LinuxPlatform::LinuxPlatform(DeviceRoot root)
    : services_(std::make_unique<Services>(std::move(root))) {}
LinuxPlatform::~LinuxPlatform() = default;

Platform& LinuxPlatform::platform() {
  return services_->platform;
}
const DeviceRoot& LinuxPlatform::root() const {
  return services_->root;
}
FileLayer& LinuxPlatform::fileLayer() {
  return services_->layer;
}
FilePreferences& LinuxPlatform::preferences() {
  return services_->preferences;
}
FileSubmission& LinuxPlatform::submission() {
  return services_->submission;
}
SqliteStore& LinuxPlatform::store() {
  return services_->store;
}

}  // namespace tavrel
