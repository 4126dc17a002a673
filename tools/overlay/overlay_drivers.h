// A driver registry that reports its use.
#pragma once

#include <memory>

#include "platform/driver_registry.h"
#include "tools/overlay/overlay_events.h"

namespace tavrel {

/// Services and connections pass through to `below`, since recorded drivers change nothing on disk.
/// The objects that this returns must not outlive `below` or `events`.
class OverlayDrivers final : public DriverRegistry {
 public:
  OverlayDrivers(DriverRegistry& below, const OverlayEvents& events)
      : below_(below), events_(events) {}

  std::shared_ptr<DriverService> firstService(std::string_view className) override;
  KernelReturn matchingServices(const plist::Dictionary& matching,
                                std::unique_ptr<ServiceIterator>& services) override;

 private:
  DriverRegistry& below_;
  const OverlayEvents& events_;
};

}  // namespace tavrel
