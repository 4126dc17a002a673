// The ID that the kernel gives each boot.
#pragma once

#include <string>
#include <string_view>

#include "platform/linux/files/device_root.h"

namespace tavrel {

inline constexpr std::string_view kBootIDFile = "/proc/sys/kernel/random/boot_id";

/// Without blanks and line ends. The machine's where the root does not have the file; empty when it
/// cannot be read.
std::string bootIDOf(const DeviceRoot& root);

}  // namespace tavrel
