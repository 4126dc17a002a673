// Finds out from the kernel's routing tables whether a usable network is available.
#pragma once

#include <string>

#include "base/expected.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "upload/configuration.h"

namespace tavrel::upload {

/// Why nothing may be sent now, such as "there is no default route"; empty when sending is allowed.
/// A server on this machine can always be reached. An error when the tables cannot be read.
Expected<std::string> reasonToWait(const DeviceRoot& root, FileSystem& files,
                                   const Configuration& configuration);

}  // namespace tavrel::upload
