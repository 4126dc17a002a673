// The applications that appear in menus, from their desktop entries.
//
// Entries are files *.desktop below the "applications" folder of each data folder. An entry counts
// when it has "Type=Application" and neither "NoDisplay=true" nor "Hidden=true". The file's path
// below that folder, with "-" for "/", names the application. Of entries with the same name, the
// one in the first of these data folders counts:
//
//   /home/*/.local/share, /root/.local/share    the users' own
//   /var/lib/flatpak/exports/share, /usr/local/share
//   /usr/share                                  the system's
//
// A user's folder that is a symbolic link is skipped, and so is an entry larger than
// `limits::kDesktopEntryBytes`. The walk ends after `limits::kDesktopFiles` files and folders.
//
// Applications of all folders except the last count as installed by the user.
#pragma once

#include <functional>

#include "platform/application_registry.h"
#include "platform/linux/files/device_root.h"
#include "platform/system_log.h"

namespace tavrel {

void enumerateDesktopEntries(const DeviceRoot& root, SystemLog& log,
                             const std::function<void(const PWBundleProxy&)>& handler);

}  // namespace tavrel
