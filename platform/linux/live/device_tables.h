// The devices whose figures are single files, and the meaning of those files.
#pragma once

#include <span>

#include "platform/linux/live/attribute_class.h"

namespace tavrel::live {

/// Each becomes one source.
std::span<const DeviceClass> deviceClasses();

/// The figures of /sys/power/suspend_stats, a folder without devices.
std::span<const Attribute> suspendAttributes();

}  // namespace tavrel::live
