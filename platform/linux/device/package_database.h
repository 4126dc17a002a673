// The installed packages, from the database of the package manager dpkg.
//
// /var/lib/dpkg/status and /var/lib/apt/extended_states under the device root, both in paragraphs
// of "Field: value". They are streamed; only the names of automatic packages stay in memory.
#pragma once

#include <cstddef>
#include <functional>

#include "platform/application_registry.h"
#include "platform/linux/files/device_root.h"
#include "platform/system_log.h"

namespace tavrel {

/// Calls `handler` for each installed package, once for each architecture, identified as
/// "name:architecture". A package counts as installed by the user when apt did not install it as a
/// dependency and it is not part of the base system (priority required or important, Essential or
/// Protected). Returns the number of packages; for 0 the caller falls back to desktop entries. Logs
/// a file that exists but cannot be read, and what that changes.
std::size_t enumeratePackages(const DeviceRoot& root, SystemLog& log,
                              const std::function<void(const PWBundleProxy&)>& handler);

}  // namespace tavrel
