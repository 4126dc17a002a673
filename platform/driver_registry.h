// The kernel's registry of driver services.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>

#include "base/kernel_return.h"
#include "base/plist.h"
#include "platform/user_client.h"

namespace tavrel {

/// A reference to a registered service.
class DriverService {
 public:
  virtual ~DriverService() = default;

  virtual KernelReturn entryID(std::uint64_t& id) = 0;
  /// At most 127 characters.
  virtual KernelReturn name(std::string& name) = 0;
  virtual std::uint32_t userRetainCount() = 0;

  /// A property of the service; null when absent. The value is the caller's own.
  virtual plist::Value property(std::string_view key) = 0;
  /// The same, searched for on the service and up through its parents in a plane.
  virtual plist::Value searchProperty(std::string_view plane, std::string_view key) = 0;

  /// Opens a user client for this task. `client` stays empty on failure.
  virtual KernelReturn open(std::uint32_t type, std::unique_ptr<UserClient>& client) = 0;
};

/// A walk over services.
class ServiceIterator {
 public:
  virtual ~ServiceIterator() = default;
  /// False once the registry has changed during the walk.
  virtual bool isValid() = 0;
  /// Null when none is left.
  virtual std::shared_ptr<DriverService> next() = 0;
};

class DriverRegistry {
 public:
  virtual ~DriverRegistry() = default;

  /// The first registered service of a class; null when there is none.
  virtual std::shared_ptr<DriverService> firstService(std::string_view className) = 0;

  /// All services that a matching dictionary describes.
  virtual KernelReturn matchingServices(const plist::Dictionary& matching,
                                        std::unique_ptr<ServiceIterator>& services) = 0;
};

}  // namespace tavrel
