#include "tools/overlay/overlay_platform.h"

#include <cerrno>
#include <fcntl.h>
#include <utility>

#include "platform/linux/files/file_system.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/logs/file_crash_reporting.h"
#include "platform/linux/preferences/file_preferences.h"
#include "platform/linux/process/linux_clock.h"
#include "platform/plist/coding.h"
#include "tools/overlay/overlay_drivers.h"
#include "tools/overlay/overlay_reads.h"
#include "tools/overlay/overlay_writes.h"

namespace tavrel {
namespace {

// Makes sure that the services below an overlay cannot change a file, not even by mistake.
class ReadOnlyFileSystem final : public FileSystem {
 protected:
  int openFile(const char* path, int flags, mode_t mode) override {
    const bool isReading = (flags & (O_ACCMODE | O_CREAT)) == O_RDONLY;
    return isReading ? FileSystem::openFile(path, flags, mode) : refuse();
  }
  int truncateFile(int, off_t) override { return refuse(); }
  int renameFile(const char*, const char*) override { return refuse(); }
  int linkFile(const char*, const char*) override { return refuse(); }
  int removeFile(const char*) override { return refuse(); }
  int makeFolder(const char*, mode_t) override { return refuse(); }

 private:
  static int refuse() {
    errno = EROFS;
    return -1;
  }
};

// The NAND log names the program that writes it.
class DaemonProcess final : public Process {
 public:
  explicit DaemonProcess(Process& below) : below_(below) {}
  std::string name() override { return "tavrel"; }
  std::int32_t identifier() override { return below_.identifier(); }

 private:
  Process& below_;
};

}  // namespace

// Gives the services below a platform of their own, so that their messages go to the overlay, too.
struct OverlayPlatform::Services {
  explicit Services(LinuxPlatform& device) : root(device.root()) {
    platform.applications = applications;
    platform.crashReporting = crashReporting;
    platform.deviceAnswers = answers;
    platform.drivers = drivers;
    platform.dynamicLoader = loader;
    platform.files = files;
    platform.locale = locale;
    platform.notifications = notifications;
    platform.process = process;
    platform.standardStreams = streams;
    platform.statistics = store;
    platform.submission = submission;
    platform.systemControls = systemControls;
    platform.systemVersion = systemVersion;
  }

  const DeviceRoot& root;
  OverlayEvents events;
  OverlayLog log{events};
  ReadOnlyFileSystem fileSystem;
  LinuxClock clock;
  plist::PlistCoding propertyLists;
  FilePreferences filePreferences{root, fileSystem, propertyLists, clock, log};
  OverlayPreferences preferences{filePreferences, events};
  LinuxPlatform below{
      root,
      {.log = &log, .fileSystem = &fileSystem, .preferences = &preferences, .readOnly = true}};
  Platform platform = below.platform();

  OverlayApplications applications{platform.applications, events};
  OverlayCrashReporting crashReporting{below.crashReporting(), events};
  OverlayAnswers answers{platform.deviceAnswers, events};
  OverlayDrivers drivers{platform.drivers, events};
  OverlayLoader loader{platform.dynamicLoader, preferences, events};
  OverlayFileReader files{platform.files, events};
  OverlayLocale locale{platform.locale, events};
  OverlayNotifications notifications{events};
  DaemonProcess process{platform.process};
  OverlayStreams streams{events};
  OverlayStore store{platform.statistics, events};
  OverlaySubmission submission{below.submission(), events};
  OverlayControls systemControls{platform.systemControls, events};
  OverlaySystemVersion systemVersion{platform.systemVersion, events};
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

const std::vector<std::string>& OverlayPlatform::missingValues() const {
  return services_->below.missingValues();
}

std::string_view OverlayPlatform::lastError() const {
  return services_->log.lastError;
}

}  // namespace tavrel
