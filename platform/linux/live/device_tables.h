// The devices whose figures are single files, and what those mean.
#pragma once

#include <span>

#include "platform/linux/live/attribute_class.h"

namespace tavrel::live {

/// One source for each.
std::span<const DeviceClass> deviceClasses();

/// Of /sys/power/suspend_stats, a folder without devices.
std::span<const Attribute> suspendAttributes();

}  // namespace tavrel::live
