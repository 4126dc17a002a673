#include "platform/linux/device/linux_applications.h"

#include "platform/linux/device/desktop_entries.h"
#include "platform/linux/device/package_database.h"

namespace tavrel {

void LinuxApplications::enumerateBundles(std::uint32_t kind,
                                         const std::function<void(const PWBundleProxy&)>& handler) {
  if (kind != kInstalledApplications) return;
  if (enumeratePackages(root_, log_, handler) == 0) {
    enumerateDesktopEntries(root_, log_, handler);
  }
}

}  // namespace tavrel
