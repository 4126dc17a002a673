#include "platform/linux/recorded_registry.h"

namespace tavrel {

struct RecordedRegistry::Recording {};

RecordedRegistry::RecordedRegistry(const DeviceRoot&, FileLayer&, PropertyListCoding&, SystemLog&) {
}
RecordedRegistry::RecordedRegistry(const plist::Dictionary&, SystemLog&) {}
RecordedRegistry::~RecordedRegistry() = default;

std::shared_ptr<DriverService> RecordedRegistry::firstService(std::string_view) {
  return nullptr;
}

KernelReturn RecordedRegistry::matchingServices(const plist::Dictionary&,
                                                std::unique_ptr<ServiceIterator>&) {
  return kKernelNotFound;
}

}  // namespace tavrel
