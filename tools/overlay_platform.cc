#include "tools/overlay_platform.h"

#include <cerrno>
#include <fcntl.h>
#include <utility>

#include "base/limits.h"
#include "platform/linux/file_crash_reporting.h"
#include "platform/linux/file_device_answers.h"
#include "platform/linux/file_preferences.h"
#include "platform/linux/file_submission.h"
#include "platform/linux/linux_applications.h"
#include "platform/linux/linux_dynamic_loader.h"
#include "platform/linux/linux_files.h"
#include "platform/linux/linux_locale.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/linux_system_controls.h"
#include "platform/linux/linux_system_version.h"
#include "platform/linux/recorded_registry.h"
#include "platform/linux/sqlite_store.h"
#include "platform/plist/coding.h"
#include "tools/overlay_drivers.h"
#include "tools/overlay_reads.h"

namespace tavrel {
namespace {

// What is below an overlay could not change a file if it tried.
class ReadOnlyFileLayer final : public FileLayer {
 protected:
  int openFile(const char* path, int flags, mode_t mode) override {
    const bool isReading = (flags & (O_ACCMODE | O_CREAT)) == O_RDONLY;
    return isReading ? FileLayer::openFile(path, flags, mode) : refuse();
  }
  int truncateFile(int, off_t) override { return refuse(); }
  int renameFile(const char*, const char*) override { return refuse(); }
  int removeFile(const char*) override { return refuse(); }
  int makeFolder(const char*, mode_t) override { return refuse(); }

 private:
  static int refuse() {
    errno = EROFS;
    return -1;
  }
};

}  // namespace

// Readers of the device's files of its own, so that what they have to say goes to the overlay too.
// Each stands before the overlay over it.
struct OverlayPlatform::Services {
  explicit Services(LinuxPlatform& linuxBelow)
      : below(linuxBelow.platform()), root(linuxBelow.root()) {}

  Platform& below;
  const DeviceRoot& root;
  OverlayEvents events;
  OverlayLog log{events};
  OverlayStreams streams{events};
  ReadOnlyFileLayer layer;
  plist::PlistCoding propertyLists;

  FilePreferences filePreferences{root, layer, propertyLists, below.clock, log};
  OverlayPreferences preferences{filePreferences, events};
  LinuxFiles linuxFiles{root, layer};
  OverlayFiles files{linuxFiles, events};
  LinuxSystemVersion linuxVersion{root, layer, propertyLists, log};
  OverlaySystemVersion systemVersion{linuxVersion, events};
  FileSubmission fileSubmission{root,        layer, propertyLists, preferences, linuxVersion,
                                below.clock, log};
  OverlaySubmission submission{fileSubmission, events};
  FileCrashReporting fileCrashReporting{root, layer, linuxVersion, below.clock, log};
  OverlayCrashReporting crashReporting{fileCrashReporting, events};
  FileDeviceAnswers fileAnswers{root, layer, propertyLists, log};
  OverlayAnswers answers{fileAnswers, events};
  LinuxSystemControls linuxControls{root, layer, propertyLists, log, EccEvents::Mode::Peek};
  OverlayControls systemControls{linuxControls, events};
  LinuxApplications linuxApplications{root, log};
  OverlayApplications applications{linuxApplications, events};
  LinuxLocale linuxLocale{root, log};
  OverlayLocale locale{linuxLocale, events};
  LinuxDynamicLoader linuxLoader{root, layer, propertyLists, log, preferences};
  OverlayLoader loader{linuxLoader, preferences, events};
  RecordedRegistry recordedDrivers{root, layer, propertyLists, log};
  OverlayDrivers drivers{recordedDrivers, events};
  SqliteStore sqliteStore{root, below.clock, preferences, log, limits::kStoreBusyMilliseconds,
                          true};
  OverlayStore store{sqliteStore, events};
  OverlayNotifications notifications{events};
  ProcessState state;

  Platform platform{
      .applications = applications,
      .clock = below.clock,
      .crashReporting = crashReporting,
      .dateFormatting = below.dateFormatting,
      .deviceAnswers = answers,
      .digest = below.digest,
      .drivers = drivers,
      .dynamicLoader = loader,
      .eventLoop = below.eventLoop,
      .files = files,
      .locale = locale,
      .log = log,
      .namedServices = below.namedServices,
      .notifications = notifications,
      .preferences = preferences,
      .process = below.process,
      .propertyLists = propertyLists,
      .stackSnapshots = below.stackSnapshots,
      .standardStreams = streams,
      .statistics = store,
      .submission = submission,
      .systemControls = systemControls,
      .systemVersion = systemVersion,
      .state = state,
  };
};

OverlayPlatform::OverlayPlatform(LinuxPlatform& below)
    : services_(std::make_unique<Services>(below)) {}
OverlayPlatform::~OverlayPlatform() = default;

Platform& OverlayPlatform::platform() {
  return services_->platform;
}

void OverlayPlatform::setEventHandler(OverlayEvents::Handler handler) {
  services_->events.setHandler(std::move(handler));
}

void OverlayPlatform::replaceFile(std::string path, std::string content) {
  services_->files.replaced[std::move(path)] = std::move(content);
}

const std::vector<CapturedLog>& OverlayPlatform::logs() const {
  return services_->submission.logs;
}

std::string_view OverlayPlatform::lastError() const {
  return services_->log.lastError;
}

}  // namespace tavrel
