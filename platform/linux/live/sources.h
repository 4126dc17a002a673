// The sources that are not a table of devices. Each adds the channels of its facility, and none
// when the kernel does not show it.
#pragma once

#include "platform/linux/files/device_root.h"
#include "platform/linux/live/live_source.h"

namespace tavrel::live {

void addBlockDevices(const DeviceRoot& root, LiveSource& source);
void addBoot(const DeviceRoot& root, LiveSource& source);
void addControlGroups(const DeviceRoot& root, LiveSource& source);
void addCooling(const DeviceRoot& root, LiveSource& source);
void addCpuFrequency(const DeviceRoot& root, LiveSource& source);
void addCpuIdle(const DeviceRoot& root, LiveSource& source);
void addCpuTime(const DeviceRoot& root, LiveSource& source);
void addDeviceFrequency(const DeviceRoot& root, LiveSource& source);
void addFileSystems(const DeviceRoot& root, LiveSource& source);
void addHealth(const DeviceRoot& root, LiveSource& source);
void addInterrupts(const DeviceRoot& root, LiveSource& source);
void addMemory(const DeviceRoot& root, LiveSource& source);
void addNetwork(const DeviceRoot& root, LiveSource& source);
void addPressure(const DeviceRoot& root, LiveSource& source);
void addScheduler(const DeviceRoot& root, LiveSource& source);
void addSuspend(const DeviceRoot& root, LiveSource& source);
void addSwapDevices(const DeviceRoot& root, LiveSource& source);

}  // namespace tavrel::live
