// The registry of drivers, played back from recordings.
//
// Linux has no such registry: what a device's drivers publish and answer is recorded as property
// lists in /var/lib/tavrel/registry under the device root. docs/registry.md describes the format.
//
// A walk goes on over the services as they were when it began. It stops being valid when the
// generation of the recordings is no longer the one that it began with.
#pragma once

#include <memory>
#include <string_view>

#include "base/plist.h"
#include "platform/driver_registry.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/property_list_coding.h"
#include "platform/system_log.h"

namespace tavrel {

class RecordedRegistry final : public DriverRegistry {
 public:
  /// Reads the folder when it is first asked for a service, and again what has changed since.
  RecordedRegistry(const DeviceRoot& root, FileSystem& files, PropertyListCoding& propertyLists,
                   SystemLog& log);
  /// Plays one recording, in the form that a file of the folder has. The dictionary is shared: a
  /// change of it is seen, of its services and channels once its "Generation" has changed too.
  RecordedRegistry(const plist::Dictionary& recording, SystemLog& log);
  ~RecordedRegistry() override;

  std::shared_ptr<DriverService> firstService(std::string_view className) override;
  KernelReturn matchingServices(const plist::Dictionary& matching,
                                std::unique_ptr<ServiceIterator>& services) override;

  /// Everything that the registry shows now, as one recording that plays back the same.
  plist::Dictionary recording();

 private:
  class State;
  class Walk;
  std::shared_ptr<State> state_;
};

}  // namespace tavrel
