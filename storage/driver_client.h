// A connection to a storage driver for the duration of one piece of work.
#pragma once

#include "platform/driver_registry.h"
#include "platform/standard_streams.h"

namespace tavrel {

/// Opens the service, calls `use(UserClient&)`, and closes. False when the service cannot be
/// opened, otherwise the result of `use`. Prints failures of opening and closing on standard error.
template <class Use>
bool withClient(DriverService& service, StandardStreams& streams, Use use) {
  std::unique_ptr<UserClient> client;
  if (service.open(0, client) != kKernelSuccess) {
    streams.writeError("Could not get connection to service\n");
    return false;
  }
  const bool result = use(*client);
  if (client->close() != kKernelSuccess) {
    streams.writeError("Could not close connection to service\n");
  }
  return result;
}

}  // namespace tavrel
