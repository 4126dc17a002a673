// The registry of drivers, played back from recordings.
//
// Linux has no such registry. Property lists in /var/lib/tavrel/registry under the device root
// record what a device's drivers publish and answer. docs/registry.md describes the format.
//
// A walk covers the services that existed when it began. It becomes invalid when the generation of
// the recordings changes.
#pragma once

#include <memory>
#include <string_view>

#include "base/plist.h"
#include "platform/driver_registry.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/recorded/live_services.h"
#include "platform/property_list_coding.h"
#include "platform/system_log.h"

namespace tavrel {

class RecordedRegistry final : public DriverRegistry {
 public:
  /// Reads the folder on the first request for a service, and later reads changed files again.
  /// Shows live services, where given, beside the recorded ones; they must outlive it.
  RecordedRegistry(const DeviceRoot& root, FileSystem& files, PropertyListCoding& propertyLists,
                   SystemLog& log, LiveServices* live = nullptr);
  /// Plays one recording, a dictionary in the form of a recording file. The dictionary is shared,
  /// so its changes show; those of its services and channels once its "Generation" has changed too.
  RecordedRegistry(const plist::Dictionary& recording, SystemLog& log);
  ~RecordedRegistry() override;

  std::shared_ptr<DriverService> firstService(std::string_view className) override;
  KernelReturn matchingServices(const plist::Dictionary& matching,
                                std::unique_ptr<ServiceIterator>& services) override;

  /// All recorded content that the registry shows now, as one recording that plays back the same.
  plist::Dictionary recording();

  /// The live services that are shown, in the form of a recording.
  plist::Array liveServices();

 private:
  class State;
  class Walk;
  std::shared_ptr<State> state_;
};

}  // namespace tavrel
