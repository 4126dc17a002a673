// The installed packages, from the database of the package manager dpkg.
//
// /var/lib/dpkg/status and /var/lib/apt/extended_states under the device root, both in paragraphs
// of "Field: value". They are streamed; only the names of automatic packages are held.
#pragma once

#include <cstddef>
#include <functional>

#include "platform/application_registry.h"
#include "platform/linux/files/device_root.h"
#include "platform/system_log.h"

namespace tavrel {

/// Calls `handler` for every installed package, one for each architecture that it is installed
/// for, identified as "name:architecture". The user installed a package when apt did not install
/// it for another's sake and it is no part of the base system (priority required or important,
/// Essential or Protected). Yields how many there are, for 0 of which the caller counts desktop
/// entries. A file that is there but cannot be read is logged, with what counts then.
std::size_t enumeratePackages(const DeviceRoot& root, SystemLog& log,
                              const std::function<void(const PWBundleProxy&)>& handler);

}  // namespace tavrel
