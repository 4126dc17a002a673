// The installed applications of a Linux device.
//
// Kind 1, all installed applications, is the list of the package manager (package_database.h) or,
// when that is empty, of the desktop entries (desktop_entries.h). Other kinds have no bundles.
#pragma once

#include "platform/application_registry.h"
#include "platform/linux/files/device_root.h"
#include "platform/system_log.h"

namespace tavrel {

class LinuxApplications final : public PWApplicationWorkspace {
 public:
  LinuxApplications(const DeviceRoot& root, SystemLog& log) : root_(root), log_(log) {}

  void enumerateBundles(std::uint32_t kind,
                        const std::function<void(const PWBundleProxy&)>& handler) override;

 private:
  const DeviceRoot& root_;
  SystemLog& log_;
};

}  // namespace tavrel
