// Connections to the storage driver, and its advice on freeing space.
//
//   ASPConnection connection;
//   if (openASPConnection(drivers, streams, connection)) connection.connection->callMethod(...);
//   closeASPConnection(connection);
//
// A connection that goes out of scope is closed. Failures are printed on standard error.
#pragma once

#include <memory>

#include "platform/driver_registry.h"
#include "platform/standard_streams.h"
#include "storage/nand_exporters.h"

namespace tavrel {

struct ASPConnection {
  std::shared_ptr<DriverService> service;
  std::unique_ptr<UserClient> connection;
  const NandExporter* exporter = nullptr;
};

/// True when the driver exists, can be opened and has statistics in the known format; otherwise the
/// connection is closed again.
bool openASPConnection(DriverRegistry& drivers, StandardStreams& streams,
                       ASPConnection& connection);

/// Does nothing when already closed.
void closeASPConnection(ASPConnection& connection);

/// Connects to the first driver that is present; null when there is none. `exporter` receives its
/// row.
std::unique_ptr<UserClient> ANDConnect(DriverRegistry& drivers, StandardStreams& streams,
                                       const NandExporter*& exporter);

/// Closes the connection. Closing an empty handle fails.
void ANDDisconnect(StandardStreams& streams, std::unique_ptr<UserClient> connection);

/// Whether the controller recommends deleting content.
bool NandRecommendsContentDeletion(DriverRegistry& drivers, StandardStreams& streams);

}  // namespace tavrel
